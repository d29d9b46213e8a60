// Keeps account of what in a movie is not real. Pure.
#pragma once
#include <array>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace lmx {

/// Collects where a movie shows something else than camera and microphone would have delivered, and tells it
/// in two ways: words for the journal while it is recorded, and one line at the end. Times are running time
/// in seconds. Not thread-safe.
class GapLedger {
 public:
  /// @param begin  running time that the times in the line count from
  explicit GapLedger(double begin = 0) : begin_(begin) {}

  /// That many frames from `t` on were lost; the one before is shown in their place.
  void framesDropped(double t, std::uint32_t count) { add(Kind::frames, t, t, count); }
  /// So many seconds of silence were put in from `t` on.
  void silencePutIn(double t, double seconds) {
    if (seconds > 0) add(Kind::silence, t, t + seconds, seconds);
  }
  void microphoneLost(double t) { microphone_lost_ = microphone_lost_.value_or(t); }
  void microphoneBack(double t) { back(Kind::microphone, microphone_lost_, t); }
  /// A network camera is being called again: a still picture and silence meanwhile.
  void cameraLost(double t) { camera_lost_ = camera_lost_.value_or(t); }
  void cameraBack(double t) { back(Kind::camera, camera_lost_, t); }
  /// The wall clock was set forward (or back, below zero) by so many seconds.
  void clockStepped(double t, double seconds) { add(Kind::clock, t, t, seconds); }
  /// The camera's pictures have another size from `t` on and are scaled into the movie's.
  void pictureSizeChanged(double t, int width, int height);
  /// How much faster the microphone's clock runs than the machine's, parts in a million. The last one counts.
  void soundCorrected(double partsPerMillion) { parts_per_million_ = partsPerMillion; }

  /// Lines for the journal, as words, that have become due at `now`: losses that go on for a while are one.
  using Words = std::vector<std::string>;
  std::vector<Words> journalWords(double now);
  /// Ends what goes on. @return the lines that are left
  std::vector<Words> finish(double now);
  /// What is not real, in one line; empty when all is. Call it after finish().
  [[nodiscard]] std::string summary() const;

 private:
  enum class Kind { frames, silence, microphone, camera, clock, size };
  static constexpr std::size_t kKinds = 6;
  struct Entry {
    Kind kind = Kind::frames;
    double from = 0;
    double to = 0;
    double amount = 0;  ///< frames, seconds
    std::string text;   ///< a size
  };
  /// All entries of a kind, also of those that are no longer kept.
  struct Sum {
    std::uint32_t entries = 0;
    double amount = 0;
    std::vector<Entry> first;  ///< the first few, for the line
  };

  void add(Kind kind, double from, double to, double amount, std::string text = {});
  void back(Kind kind, std::optional<double>& lost, double t);
  void close(const Entry& entry);
  [[nodiscard]] static Words wordsOf(const Entry& entry);
  [[nodiscard]] const Sum& sum(Kind kind) const { return sums_[static_cast<std::size_t>(kind)]; }
  [[nodiscard]] std::string told(const Entry& entry) const;
  [[nodiscard]] std::string clockText(double t) const;

  const double begin_;
  std::map<Kind, Entry> open_;  ///< entries that may still grow
  std::vector<Words> due_;
  std::array<Sum, kKinds> sums_;
  std::optional<double> microphone_lost_;
  std::optional<double> camera_lost_;
  double parts_per_million_ = 0;
};

}  // namespace lmx
