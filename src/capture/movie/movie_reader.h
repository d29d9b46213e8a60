// Reads back the index of a movie of ours, also of one whose writer died.
#pragma once
#include <optional>
#include <string>

#include "capture/movie/movie_index.h"

namespace lmx {

/// The index of a file that GrowingMovie wrote, finished or not. What stands behind its last whole fragment
/// is left out; every sample of the index lies inside the file.
/// @return nothing when the file can't be read, is no such movie or holds no header yet
std::optional<MovieIndex> readMovieIndex(const std::string& path);

}  // namespace lmx
