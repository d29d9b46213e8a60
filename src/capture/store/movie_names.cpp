// Finds free names and renames what is in the way.
#include "capture/store/movie_names.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>

#include "platform/log.h"
#include "platform/paths.h"

namespace lmx {
namespace {

constexpr std::size_t kLongestName = 200;

bool exists(const std::string& path) { return access(path.c_str(), F_OK) == 0; }

bool continuesCharacter(char c) { return (static_cast<unsigned char>(c) & 0xC0) == 0x80; }

}  // namespace

std::string fittingName(std::string name) {
  std::size_t length = std::min(name.size(), kLongestName);
  while (length > 0 && length < name.size() && continuesCharacter(name[length])) --length;
  name.resize(length);
  return name;
}

std::string freeStem(const std::string& stem) {
  std::string free = stem;
  for (int i = 1; exists(free + ".mov") || exists(free + ".xml"); ++i) free = stem + "-" + std::to_string(i);
  return free;
}

int setAside(const std::string& path) {
  if (!exists(path)) return 0;
  const std::string stem = path.ends_with(".mov") ? path.substr(0, path.size() - 4) : path;
  const std::string name = fittingName(stem.substr(stem.rfind('/') + 1));
  const std::string aside = freeStem(directoryOf(path) + "/" + name + "-replaced");
  if (rename(path.c_str(), (aside + ".mov").c_str()) != 0) return errno;
  LMPLogMessage(nullptr, kLogWarning, "%s was there already, it is now %s.mov", path.c_str(), aside.c_str());
  if (exists(stem + ".xml") && rename((stem + ".xml").c_str(), (aside + ".xml").c_str()) != 0) return errno;
  return 0;
}

}  // namespace lmx
