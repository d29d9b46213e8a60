// Makes a fragmented movie file a whole one, in place.
#pragma once
#include <string>

#include "capture/movie/movie_index.h"

namespace lmx {

/// Appends `index` behind the media of `fd` and syncs it; then one 16-byte write turns all fragments into the
/// media of a whole movie. Time and space are those of the index, however long the movie is. When the index
/// finds no room the file stays fragmented, and playable. @return 0 or the errno
int finishMovie(int fd, const MovieIndex& index);

/// The same for the file `path`. A file that is whole already stays whole.
int finishMovieInPlace(const std::string& path, const MovieIndex& index);

}  // namespace lmx
