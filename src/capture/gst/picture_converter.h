// Brings pictures of any raw format into the form in which all of them are recorded and shown.
#pragma once
#include <gst/video/video.h>

#include <memory>
#include <optional>
#include <string>

#include "capture/api/picture.h"
#include "capture/gst/gst_handles.h"
#include "capture/gst/picture_format.h"
#include "capture/media/colour_matrix.h"

namespace lmx {

class VideoFrame;

/// Converts pictures of any raw format and size to I420, BT.709 limited range, square pixels, one size. Other
/// sizes are fitted in with black bars, keeping their aspect ratio. Not thread-safe.
///
/// Size and format are GStreamer's business. The colours are ours: its conversion of 8-bit colours is off by
/// up to 3 of 255, wrong for RGB in limited range, and takes ten times as long.
class PictureConverter {
 public:
  /// @param size  even numbers, at least 16
  explicit PictureConverter(PictureSize size);
  ~PictureConverter();

  /// @param caps  raw video, the same object as long as the format stays
  /// @return the picture with the times of `buffer`; a reference to `buffer` itself where nothing is to be
  ///         converted; null when it can't be read, with a log line for each format
  BufferHandle convert(GstBuffer* buffer, GstCaps* caps);

  /// What has changed in the input's format since the last call, in words: once for each change.
  std::optional<std::string> formatChange();

 private:
  bool accept(GstCaps* caps);
  bool prepare();
  bool prepareShape(GstVideoFormat format, PictureSize size, const GstVideoRectangle& place);
  BufferHandle converted(GstBuffer* buffer);
  BufferHandle newPicture();
  bool paint(VideoFrame& in, GstBuffer* picture);
  bool paintRGB(VideoFrame& in, const PlanesOut& target);

  struct FreeConverter {
    void operator()(GstVideoConverter* converter) const noexcept { gst_video_converter_free(converter); }
  };

  PictureSize size_;
  GstVideoInfo out_{};
  GstHandle<GstBufferPool> pool_;
  std::optional<std::string> change_;
  // For the caps of the input:
  CapsHandle caps_;      ///< null before the first picture
  bool usable_ = false;  ///< whether pictures of those caps can be converted
  bool complained_ = false;
  GstVideoInfo in_{};
  GstVideoRectangle place_{};                                ///< where the input goes in the picture
  std::unique_ptr<GstVideoConverter, FreeConverter> shape_;  ///< null where format and size fit
  GstVideoInfo shaped_{};                                    ///< what it makes
  BufferHandle scratch_;                                     ///< takes that where it is RGB
  std::optional<ColourMatrix> colours_;                      ///< nothing where the colours fit
  std::optional<RGBMatrix> rgb_;                             ///< for RGB
};

}  // namespace lmx
