// Entry point of the process.
#include <unistd.h>

#include <cstdio>

#include "capture/api/capture_framework.h"
#include "capture/framework.h"
#include "cli/process.h"

int main(int argc, char** argv) {
  const int status = lmx::runAgentProcess(argc, argv, lmx::newCaptureFramework());
  std::fflush(nullptr);
  _exit(status);  // skip destructors: other threads are still running
}
