// Finds free names and renames what is in the way.
#include "capture/store/movie_names.h"

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>

#include "platform/log.h"
#include "platform/paths.h"

namespace lmx {
namespace {

/// Also for a link that leads nowhere.
bool exists(const std::string& path) {
  struct stat status {};
  return lstat(path.c_str(), &status) == 0;
}

bool continuesCharacter(char c) { return (static_cast<unsigned char>(c) & 0xC0) == 0x80; }

}  // namespace

std::string fittingName(std::string name) {
  std::size_t length = std::min(name.size(), kLongestRecordingName);
  while (length > 0 && length < name.size() && continuesCharacter(name[length])) --length;
  name.resize(length);
  return name;
}

std::string freeStem(const std::string& stem) {
  std::string free = stem;
  for (int i = 1; exists(free + ".mov") || exists(free + ".xml"); ++i) free = stem + "-" + std::to_string(i);
  return free;
}

std::string freePath(const std::string& path) {
  const std::size_t name = path.rfind('/') == std::string::npos ? 0 : path.rfind('/') + 1;
  std::size_t dot = path.rfind('.');
  if (dot == std::string::npos || dot <= name) dot = path.size();
  std::string free = path;
  for (int i = 1; exists(free) || exists(documentPathOf(free)); ++i)
    free = path.substr(0, dot) + "-" + std::to_string(i) + path.substr(dot);
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
