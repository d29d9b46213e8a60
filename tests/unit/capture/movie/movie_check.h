// Decodes a movie with GStreamer, not with the code that wrote it, and tells what is in it.
#pragma once
#include <cstdint>
#include <string>
#include <vector>

namespace lmx::testing {

struct DecodedMovie {
  std::vector<std::uint32_t> frameNumbers;  ///< the synthetic camera's, in order of presentation
  std::vector<double> frameTimes;           ///< seconds
  double duration = 0;                      ///< seconds, as the demuxer says
  int width = 0;
  int height = 0;
  int sampleRate = 0;
  std::vector<float> sound;  ///< first channel
  double soundStart = 0;     ///< seconds of the first sample
  std::string problem;       ///< a message of the decoder, empty when there was none
};

enum class Streams { both, picture, sound };

/// Decodes all of `path`, which has those streams.
DecodedMovie decodeMovie(const std::string& path, Streams streams = Streams::both);

/// Seconds: the microphone's tick fills the last 479 samples before each full second.
inline constexpr double kTickLead = 479.0 / 48000.0;

/// Times (seconds) at which a tick of the synthetic microphone begins.
std::vector<double> tickTimes(const DecodedMovie& movie);

/// Lengths of the runs of frame numbers that follow each other without a gap.
struct NumberRun {
  std::uint32_t first = 0;
  std::uint32_t last = 0;
};
std::vector<NumberRun> numberRuns(const std::vector<std::uint32_t>& numbers);

}  // namespace lmx::testing
