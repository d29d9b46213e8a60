// A movie file that grows fragment by fragment and is readable after a crash at any moment.
#pragma once
#include <cstdint>
#include <string>
#include <vector>

#include "capture/movie/movie_index.h"
#include "support/unique_fd.h"

namespace lmx {

/// One encoded sample.
struct EncodedSample {
  std::uint32_t track = 0;  ///< index into the tracks the file was begun with
  Bytes data;
  std::uint32_t duration = 0;  ///< timescale units of the track
  bool sync = true;            ///< depends on no other sample
};

/// One thread only. Every operation returns 0 or the errno of what failed. After a failed append the file is
/// cut back to its last whole fragment: what was written stays readable.
class GrowingMovie {
 public:
  /// Creates `path`, which must not exist.
  int create(const std::string& path);
  /// Writes the header. Once, before the first append.
  int begin(const std::vector<TrackFormat>& tracks);
  /// Appends one fragment with a single write. Samples must be in decoding order within each track.
  int append(const std::vector<EncodedSample>& samples);
  int sync() const;
  /// Makes the file a whole movie (see finishMovie) and closes it.
  int finish();

  [[nodiscard]] const MovieIndex& index() const { return index_; }
  [[nodiscard]] bool begun() const { return !index_.tracks.empty(); }

 private:
  UniqueFd file_;
  MovieIndex index_;
  std::uint32_t sequence_ = 0;  ///< of the last fragment
};

}  // namespace lmx
