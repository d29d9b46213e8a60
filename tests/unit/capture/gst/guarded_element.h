// One element behind its guard, fed by a test.
#pragma once
#include <functional>
#include <string>
#include <vector>

#include "capture/gst/gst_handles.h"

namespace lmx::testing {

class GuardedElement {
 public:
  /// @param guard   what watches over the elements of a bin
  /// @param caps    of what is pushed
  /// @param wanted  caps of what comes out
  GuardedElement(const std::function<void(GstElement*)>& guard, const std::string& name,
                 const std::string& caps, const char* wanted = "ANY");
  ~GuardedElement();
  GuardedElement(const GuardedElement&) = delete;
  GuardedElement& operator=(const GuardedElement&) = delete;

  void push(GstBuffer* buffer);           ///< takes it
  void pushList(GstBufferList* buffers);  ///< takes them
  /// Everything that has come out, once all is through that was pushed.
  std::vector<SampleHandle> result();

 private:
  GstElement* add(const std::string& name);

  GstHandle<GstElement> pipeline_;
  GstElement* source_ = nullptr;
  GstElement* sink_ = nullptr;
};

/// The bytes of a sample.
std::vector<std::uint8_t> bytesOf(const SampleHandle& sample);

}  // namespace lmx::testing
