// A movie file that grows fragment by fragment, readable after a crash at any moment, and made whole in
// place.
#pragma once
#include <cstdint>
#include <optional>
#include <span>
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
  bool sync = true;
};

/// One thread only. Every operation returns 0 or the errno of what failed; after a failed append the file is
/// cut back to its last whole fragment, so that what was written stays readable.
class GrowingMovie {
 public:
  /// Creates `path` (it must not exist).
  int create(const std::string& path);
  /// Writes the header. Once, before the first append.
  int begin(const std::vector<TrackFormat>& tracks);
  /// Appends one fragment, as a single write. Samples must be in decoding order within each track.
  int append(const std::vector<EncodedSample>& samples);
  int sync() const;
  /// Makes the file a whole movie: the index is appended and synced, then one 16-byte write turns all
  /// fragments into its media. Time and space are those of the index, whatever the length. When the index
  /// finds no room the file stays as it was: fragmented, and playable.
  int finish();

  [[nodiscard]] const MovieIndex& index() const { return index_; }
  [[nodiscard]] bool begun() const { return !index_.tracks.empty(); }

 private:
  UniqueFd file_;
  MovieIndex index_;
  std::uint32_t sequence_ = 0;
};

/// The index of a file that GrowingMovie wrote, whole or not: whatever stands behind its last whole fragment
/// is left out. Nothing when the file is not such a movie or holds no header yet.
std::optional<MovieIndex> readMovieIndex(const std::string& path);

/// Makes a crashed file whole in place; a whole one is left alone. @return 0 or the errno.
int finishMovieInPlace(const std::string& path, const MovieIndex& index);

/// A half-open range of frames of the movie's clock.
struct FrameRange {
  std::uint32_t first = 0;
  std::uint32_t end = 0;
  bool operator==(const FrameRange&) const = default;
};

/// Copies `ranges` of `source` to a new movie `target`, without encoding: synced, but under its name at once,
/// so give a temporary one. A range that does not begin on a key frame begins on the one before.
/// @param frameSeconds  length of a frame of `ranges`
/// Sound moves in whole AAC frames, the rounding error carried from range to range. @return 0 or the errno.
int copyMovieRanges(const std::string& source, const MovieIndex& index, const std::vector<FrameRange>& ranges,
                    double frameSeconds, const std::string& target);

}  // namespace lmx
