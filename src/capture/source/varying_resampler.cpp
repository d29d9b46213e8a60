// Drives GStreamer's resampler.
#include "capture/source/varying_resampler.h"

#include <cmath>

namespace lmx {
namespace {

/// The ratio's denominator. A prime: the resampler would shorten any other fraction, and round its place in
/// the sound to the new denominator, which is heard. Times the filter's oversampling it must fit into an int.
constexpr std::int64_t kDenominator = 9'999'991;
constexpr guint kQuality = 4;

struct StructureFree {
  void operator()(GstStructure* structure) const noexcept { gst_structure_free(structure); }
};

GstAudioResampler* newResampler(int sampleRate, int channels, std::int64_t ratio) {
  ensureGStreamer();
  const std::unique_ptr<GstStructure, StructureFree> options(gst_structure_new_empty("options"));
  gst_audio_resampler_options_set_quality(GST_AUDIO_RESAMPLER_METHOD_KAISER, kQuality, sampleRate, sampleRate,
                                          options.get());
  gst_structure_set(options.get(), GST_AUDIO_RESAMPLER_OPT_FILTER_MODE, GST_TYPE_AUDIO_RESAMPLER_FILTER_MODE,
                    GST_AUDIO_RESAMPLER_FILTER_MODE_INTERPOLATED, GST_AUDIO_RESAMPLER_OPT_MAX_PHASE_ERROR,
                    G_TYPE_DOUBLE, 0.0, nullptr);
  return gst_audio_resampler_new(GST_AUDIO_RESAMPLER_METHOD_KAISER, GST_AUDIO_RESAMPLER_FLAG_VARIABLE_RATE,
                                 GST_AUDIO_FORMAT_F32LE, channels, static_cast<gint>(ratio),
                                 static_cast<gint>(kDenominator), options.get());
}

std::int64_t fraction(double inputPerOutput) {
  const std::int64_t ratio = std::llround(inputPerOutput * static_cast<double>(kDenominator));
  return ratio == kDenominator ? ratio + 1 : ratio;  // 1/1 would round the place to a whole sample
}

}  // namespace

VaryingResampler::VaryingResampler(int sampleRate, int channels)
    : channels_(static_cast<std::size_t>(channels)),
      ratio_(fraction(1)),
      resampler_(newResampler(sampleRate, channels, ratio_)) {}

void VaryingResampler::setRatio(double inputPerOutput) {
  const std::int64_t ratio = fraction(inputPerOutput);
  if (ratio == ratio_) return;
  ratio_ = ratio;
  gst_audio_resampler_update(resampler_.get(), static_cast<gint>(ratio), static_cast<gint>(kDenominator),
                             nullptr);
}

BufferHandle VaryingResampler::push(std::span<const float> input) {
  return resample(input.data(), input.size() / channels_);
}

BufferHandle VaryingResampler::drain() {
  const std::vector<float> silence(latency() * channels_);
  return push(silence);
}

BufferHandle VaryingResampler::resample(const float* input, std::size_t frames) {
  const std::size_t made = gst_audio_resampler_get_out_frames(resampler_.get(), frames);
  BufferHandle output(made > 0 ? gst_buffer_new_allocate(nullptr, made * channels_ * sizeof(float), nullptr)
                               : nullptr);
  GstMapInfo map{};
  if (output && gst_buffer_map(output.get(), &map, GST_MAP_WRITE) == FALSE) return nullptr;
  gpointer in[] = {const_cast<float*>(input)};  // only read
  gpointer out[] = {map.data};
  gst_audio_resampler_resample(resampler_.get(), in, frames, out, made);
  if (output) gst_buffer_unmap(output.get(), &map);
  position_ += static_cast<std::int64_t>(made) * ratio_;
  return output;
}

void VaryingResampler::restart() {
  gst_audio_resampler_reset(resampler_.get());
  position_ = 0;
}

double VaryingResampler::position() const {
  return static_cast<double>(position_) / static_cast<double>(kDenominator);
}

std::size_t VaryingResampler::latency() const {
  return gst_audio_resampler_get_max_latency(resampler_.get());
}

}  // namespace lmx
