// From pictures that can't be read to news.
#include "capture/media/unreadable_pictures.h"

#include <utility>

namespace lmx {
namespace {

constexpr double kWorthTelling = 1;  // seconds
constexpr double kHopeless = 10;     // as long as a network camera has to come back

}  // namespace

UnreadablePictures::News UnreadablePictures::note(double t, bool readable) {
  if (readable) {
    lasted_ = since_ ? t - *since_ : 0;
    since_.reset();
    told_ = false;
    return lasted_ >= kWorthTelling ? News::again : News::none;
  }
  if (!since_) since_ = t;
  if (t - *since_ < kHopeless || std::exchange(told_, true)) return News::none;
  return News::hopeless;
}

}  // namespace lmx
