// The one place that sets LMXAGENTD_ROOT.
#include "tests/unit/platform/test_root.h"

#include <stdlib.h>
#include <unistd.h>

#include <filesystem>

#include "tests/unit/doubles/temporary_directory.h"

namespace lmx::testing {
namespace {

class Root {
 public:
  Root() {
    std::filesystem::create_directory(directory_.file("dev"));
    // With slashes at the end, which must not show.
    setenv("LMXAGENTD_ROOT", (directory_.path() + "//").c_str(), 1);
  }
  [[nodiscard]] const std::string& path() const { return directory_.path(); }

 private:
  TemporaryDirectory directory_;
};

const Root root;

}  // namespace

const std::string& testRoot() { return root.path(); }

}  // namespace lmx::testing
