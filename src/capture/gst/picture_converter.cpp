// Converts pictures with GStreamer's converter and our own colour matrix.
#include "capture/gst/picture_converter.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <thread>

#include "platform/log.h"

namespace lmx {

/// A picture's memory, mapped.
class VideoFrame {
 public:
  VideoFrame(const GstVideoInfo& info, GstBuffer* buffer, GstMapFlags flags)
      : mapped_(gst_video_frame_map(&frame_, &info, buffer, flags) != FALSE) {}
  ~VideoFrame() {
    if (mapped_) gst_video_frame_unmap(&frame_);
  }
  VideoFrame(const VideoFrame&) = delete;
  VideoFrame& operator=(const VideoFrame&) = delete;
  explicit operator bool() const { return mapped_; }
  GstVideoFrame* get() { return &frame_; }

  [[nodiscard]] std::uint8_t* plane(int i) const {
    return static_cast<std::uint8_t*>(GST_VIDEO_FRAME_PLANE_DATA(&frame_, i));
  }
  [[nodiscard]] int stride(int i) const { return GST_VIDEO_FRAME_PLANE_STRIDE(&frame_, i); }
  [[nodiscard]] PlanesOut planes() const {
    return {{plane(0), plane(1), plane(2)}, {stride(0), stride(1), stride(2)}};
  }

 private:
  GstVideoFrame frame_{};
  bool mapped_;
};

namespace {

constexpr int kLargePicture = 1280 * 720;  // pixels that one thread converts in a few milliseconds
constexpr unsigned kThreads = 4;

constexpr GstVideoColorimetry kRecorded{GST_VIDEO_COLOR_RANGE_16_235, GST_VIDEO_COLOR_MATRIX_BT709,
                                        GST_VIDEO_TRANSFER_BT709, GST_VIDEO_COLOR_PRIMARIES_BT709};

/// The part of the planes that begins at a place with even coordinates.
PlanesOut from(PlanesOut planes, const GstVideoRectangle& place) {
  planes.data[0] += place.y * planes.stride[0] + place.x;
  for (int i = 1; i < 3; ++i) planes.data[i] += place.y / 2 * planes.stride[i] + place.x / 2;
  return planes;
}

/// Paints what lies outside of `place` black.
void paintBars(const PlanesOut& planes, PictureSize size, const GstVideoRectangle& place) {
  for (int i = 0; i < 3; ++i) {
    const int part = i == 0 ? 1 : 2;
    const int left = place.x / part;
    const int right = (place.x + place.w) / part;
    const auto fill = [&](int row, int from, int to) {
      std::memset(planes.data[i] + row * planes.stride[i] + from, i == 0 ? 16 : 128,
                  static_cast<std::size_t>(to - from));
    };
    for (int row = 0; row < size.height / part; ++row) {
      const bool beside = row >= place.y / part && row < (place.y + place.h) / part;
      fill(row, 0, beside ? left : size.width / part);
      if (beside) fill(row, right, size.width / part);
    }
  }
}

PlanesIn readable(const PlanesOut& planes) {
  return {{planes.data[0], planes.data[1], planes.data[2]},
          {planes.stride[0], planes.stride[1], planes.stride[2]}};
}

ColourCode codeOf(const GstVideoColorimetry& colours) {
  ColourCode code;
  gst_video_color_matrix_get_Kr_Kb(colours.matrix, &code.redWeight, &code.blueWeight);
  code.fullRange = colours.range == GST_VIDEO_COLOR_RANGE_0_255;
  return code;
}

/// Where a picture of that shape goes in one of `size`; even numbers.
GstVideoRectangle placeIn(PictureSize size, const GstVideoInfo& in) {
  const double aspect =
      static_cast<double>(in.width) * in.par_n / (static_cast<double>(in.height) * in.par_d);
  const double width = std::min<double>(size.width, size.height * aspect);
  const double height = std::min<double>(size.height, size.width / aspect);
  const auto side = [](double wanted, int available) {
    // A bar of less than two lines is a rounding error of the shape.
    if (available - wanted < 2) return available;
    return std::max(2, 2 * static_cast<int>(std::lround(wanted / 2)));
  };
  const int w = side(width, size.width);
  const int h = side(height, size.height);
  return {(size.width - w) / 4 * 2, (size.height - h) / 4 * 2, w, h};
}

GstStructure* conversion(const GstVideoRectangle& place, int pixels) {
  const unsigned threads =
      pixels > kLargePicture ? std::clamp(std::thread::hardware_concurrency(), 1U, kThreads) : 1;
  return gst_structure_new(
      "converter", GST_VIDEO_CONVERTER_OPT_DEST_X, G_TYPE_INT, place.x, GST_VIDEO_CONVERTER_OPT_DEST_Y,
      G_TYPE_INT, place.y, GST_VIDEO_CONVERTER_OPT_DEST_WIDTH, G_TYPE_INT, place.w,
      GST_VIDEO_CONVERTER_OPT_DEST_HEIGHT, G_TYPE_INT, place.h, GST_VIDEO_CONVERTER_OPT_FILL_BORDER,
      G_TYPE_BOOLEAN, FALSE, GST_VIDEO_CONVERTER_OPT_RESAMPLER_METHOD, GST_TYPE_VIDEO_RESAMPLER_METHOD,
      GST_VIDEO_RESAMPLER_METHOD_LINEAR, GST_VIDEO_CONVERTER_OPT_DITHER_METHOD, GST_TYPE_VIDEO_DITHER_METHOD,
      GST_VIDEO_DITHER_NONE, GST_VIDEO_CONVERTER_OPT_CHROMA_MODE, GST_TYPE_VIDEO_CHROMA_MODE,
      GST_VIDEO_CHROMA_MODE_FULL, GST_VIDEO_CONVERTER_OPT_THREADS, G_TYPE_UINT, threads, nullptr);
}

}  // namespace

PictureConverter::PictureConverter(PictureSize size) : size_(size) {
  ensureGStreamer();
  gst_video_info_set_format(&out_, GST_VIDEO_FORMAT_I420, static_cast<guint>(size.width),
                            static_cast<guint>(size.height));
  out_.colorimetry = kRecorded;
  pool_.reset(gst_video_buffer_pool_new());
  GstStructure* config = gst_buffer_pool_get_config(pool_.get());
  const CapsHandle caps(gst_video_info_to_caps(&out_));
  gst_buffer_pool_config_set_params(config, caps.get(), static_cast<guint>(out_.size), 0, 0);
  gst_buffer_pool_set_config(pool_.get(), config);
  gst_buffer_pool_set_active(pool_.get(), TRUE);
}

PictureConverter::~PictureConverter() { gst_buffer_pool_set_active(pool_.get(), FALSE); }

BufferHandle PictureConverter::convert(GstBuffer* buffer, GstCaps* caps) {
  BufferHandle picture = accept(caps) ? converted(buffer) : nullptr;
  if (!picture && !std::exchange(complained_, true)) {
    LMPLogMessage(nullptr, kLogError, "The camera's pictures can't be read: %s", formatText(caps).c_str());
  }
  return picture;
}

BufferHandle PictureConverter::converted(GstBuffer* buffer) {
  if (!shape_ && !colours_ && !rgb_) return BufferHandle(gst_buffer_ref(buffer));
  VideoFrame in(in_, buffer, GST_MAP_READ);
  BufferHandle picture = newPicture();
  if (!in || !picture || !paint(in, picture.get())) return nullptr;
  gst_buffer_copy_into(picture.get(), buffer,
                       static_cast<GstBufferCopyFlags>(GST_BUFFER_COPY_FLAGS | GST_BUFFER_COPY_TIMESTAMPS), 0,
                       static_cast<gsize>(-1));
  return picture;
}

bool PictureConverter::paint(VideoFrame& in, GstBuffer* picture) {
  VideoFrame out(out_, picture, GST_MAP_READWRITE);
  if (!out) return false;
  const PlanesOut target = from(out.planes(), place_);
  if (rgb_) {
    if (!paintRGB(in, target)) return false;
  } else {
    if (shape_) gst_video_converter_frame(shape_.get(), in.get(), out.get());
    if (colours_) colours_->convert(readable(shape_ ? target : in.planes()), target, place_.w, place_.h);
  }
  paintBars(out.planes(), size_, place_);  // last: GStreamer's converter makes them green in some formats
  return true;
}

bool PictureConverter::paintRGB(VideoFrame& in, const PlanesOut& target) {
  if (!shape_) {
    rgb_->convert(in.plane(0), in.stride(0), target, place_.w, place_.h);
    return true;
  }
  VideoFrame shaped(shaped_, scratch_.get(), GST_MAP_READWRITE);
  if (!shaped) return false;
  gst_video_converter_frame(shape_.get(), in.get(), shaped.get());
  rgb_->convert(shaped.plane(0), shaped.stride(0), target, place_.w, place_.h);
  return true;
}

std::optional<std::string> PictureConverter::formatChange() { return std::exchange(change_, std::nullopt); }

bool PictureConverter::accept(GstCaps* caps) {
  if (caps_.get() == caps) return usable_;
  if (caps_ && gst_caps_is_equal(caps_.get(), caps) != FALSE) return usable_;
  const std::string before = caps_ ? formatText(caps_.get()) : "";
  const std::string now = formatText(caps);
  if (caps_ && before != now) change_ = before + " has become " + now;  // else it is nothing that can be seen
  caps_.reset(gst_caps_ref(caps));
  complained_ = false;
  usable_ = prepare();
  return usable_;
}

bool PictureConverter::prepare() {
  shape_.reset();
  colours_.reset();
  rgb_.reset();
  if (gst_video_info_from_caps(&in_, caps_.get()) == FALSE || in_.finfo->format == GST_VIDEO_FORMAT_ENCODED)
    return false;
  in_.colorimetry = colorimetryOf(caps_.get(), in_.finfo);
  // What interlacing is left can't be undone here, and fields must not be scaled apart.
  in_.interlace_mode = GST_VIDEO_INTERLACE_MODE_PROGRESSIVE;
  // Some demuxers write nonsense where they know no aspect ratio.
  if (in_.par_n <= 0 || in_.par_d <= 0) in_.par_n = in_.par_d = 1;
  place_ = placeIn(size_, in_);
  if (GST_VIDEO_FORMAT_INFO_IS_RGB(in_.finfo)) {
    rgb_.emplace(in_.colorimetry.range == GST_VIDEO_COLOR_RANGE_0_255, kBT709);
    return prepareShape(GST_VIDEO_FORMAT_BGRx, {place_.w, place_.h}, {0, 0, place_.w, place_.h});
  }
  if (codeOf(in_.colorimetry) != kBT709) colours_.emplace(codeOf(in_.colorimetry), kBT709);
  return prepareShape(GST_VIDEO_FORMAT_I420, size_, place_);
}

/// Prepares the conversion of format and size, the colours left alone. @param place  the picture's in `size`
bool PictureConverter::prepareShape(GstVideoFormat format, PictureSize size, const GstVideoRectangle& place) {
  if (in_.finfo->format == format && in_.width == size.width && in_.height == size.height &&
      place.w == size.width && place.h == size.height)
    return true;
  gst_video_info_set_format(&shaped_, format, static_cast<guint>(size.width),
                            static_cast<guint>(size.height));
  shaped_.colorimetry = in_.colorimetry;
  shaped_.chroma_site = in_.chroma_site;
  shaped_.fps_n = in_.fps_n;
  shaped_.fps_d = in_.fps_d;
  if (rgb_) scratch_.reset(gst_buffer_new_allocate(nullptr, shaped_.size, nullptr));
  const int pixels = std::max(in_.width * in_.height, size.width * size.height);
  shape_.reset(gst_video_converter_new(&in_, &shaped_, conversion(place, pixels)));
  return shape_ != nullptr;
}

BufferHandle PictureConverter::newPicture() {
  GstBuffer* buffer = nullptr;
  gst_buffer_pool_acquire_buffer(pool_.get(), &buffer, nullptr);
  return BufferHandle(buffer);
}

}  // namespace lmx
