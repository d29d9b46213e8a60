// Names movies in a folder where the wanted name may be taken.
#pragma once
#include <string>

namespace lmx {

/// `name` cut to leave room for an ending: file systems take 255 bytes. No UTF-8 character is cut in two.
std::string fittingName(std::string name);

/// `stem` with the first of "", "-1", "-2" … such that neither a movie nor its document has the name.
std::string freeStem(const std::string& stem);

/// `path`, or the first of "X-1.mov", "X-2.mov" … beside it such that nothing has the movie's name nor its
/// document's.
std::string freePath(const std::string& path);

/// Frees `path`: a movie that has the name may still wait for its submission, so it gets another name
/// (logged), and its document with it. @return 0, or the errno when it stays in the way
int setAside(const std::string& path);

}  // namespace lmx
