// Process entry.
#include <unistd.h>

#include <cstdio>

#include "capture/api/capture_framework.h"
#include "capture/framework.h"
#include "cli/process.h"

int main(int argc, char** argv) {
  const int status = lmx::runAgentProcess(argc, argv, lmx::newCaptureFramework());
  std::fflush(nullptr);
  _exit(status);  // without destructors: other threads are still running
}
