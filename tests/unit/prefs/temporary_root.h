// A directory of the test's own in front of the system's fixed paths.
#pragma once
#include <cstdlib>
#include <filesystem>
#include <string>

namespace lmx::testing {

/// Made before main: where the fixed paths lie is read only once in a process.
class TemporaryRoot {
 public:
  TemporaryRoot() {
    if (::mkdtemp(path_.data()) == nullptr) std::abort();
    ::setenv("LMXAGENTD_ROOT", path_.c_str(), 1);
    setHome();
  }
  ~TemporaryRoot() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TemporaryRoot(const TemporaryRoot&) = delete;
  TemporaryRoot& operator=(const TemporaryRoot&) = delete;

  [[nodiscard]] const std::string& path() const { return path_; }
  void setHome() const { ::setenv("HOME", (path_ + "/home").c_str(), 1); }
  void clear() const {
    for (const auto& entry : std::filesystem::directory_iterator(path_)) std::filesystem::remove_all(entry);
  }

 private:
  std::string path_ = "/tmp/lmx_unit_root_XXXXXX";
};

inline const TemporaryRoot kRoot;

}  // namespace lmx::testing
