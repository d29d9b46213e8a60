// Collecting samples to fragments, writing and syncing them.
#include "capture/store/movie_writer.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstring>

#include "platform/log.h"

namespace lmx {

using namespace std::chrono_literals;

namespace {

constexpr auto kSyncInterval = 1s;
constexpr std::uint64_t kFormatPatienceSeconds = 30;

}  // namespace

MovieWriter::MovieWriter(GrowingMovie movie, std::size_t trackCount, Journal& journal,
                         const Deadline& patience, std::function<void(int)> onError)
    : movie_(std::move(movie)),
      journal_(journal),
      patience_(patience),
      on_error_(std::move(onError)),
      formats_(trackCount),
      queued_duration_(trackCount) {
  thread_ = std::thread([this] { run(); });
}

MovieWriter::~MovieWriter() { finish(); }

bool MovieWriter::setFormat(std::uint32_t track, TrackFormat format) {
  const std::lock_guard lock(mutex_);
  if (formats_used_) return false;
  formats_[track] = std::move(format);
  changed_.notify_all();
  return true;
}

void MovieWriter::add(EncodedSample sample) {
  std::unique_lock lock(mutex_);
  const auto hasRoom = [this] {
    return queued_bytes_ < kQueueLimit || ending_ || error_ != 0 || overflowed_;
  };
  if (!hasRoom()) was_full_ = true;
  while (!hasRoom() && !patience_.passed()) changed_.wait_for(lock, kDeadlineCheck);
  if (error_ != 0 || overflowed_) return;
  int problem = 0;
  if (!hasRoom()) {
    overflowed_ = true;
    problem = ETIMEDOUT;
  } else if (formatIsOverdue()) {
    error_ = problem = ENODATA;
  }
  if (problem == 0) {
    queue(std::move(sample));
    return;
  }
  changed_.notify_all();
  lock.unlock();
  on_error_(problem);
}

/// With mutex_ held.
void MovieWriter::queue(EncodedSample sample) {
  queued_bytes_ += sample.data.size();
  queued_duration_[sample.track] += sample.duration;
  queue_.push_back(std::move(sample));
  if (fragmentDue()) changed_.notify_all();
}

bool MovieWriter::formatsKnown() const {
  return std::all_of(formats_.begin(), formats_.end(), [](const auto& f) { return f.has_value(); });
}

/// Nothing can be written before all formats are known, and one that has not come by now will not come.
bool MovieWriter::formatIsOverdue() const {
  if (formatsKnown()) return false;
  for (std::size_t t = 0; t < formats_.size(); ++t) {
    if (formats_[t] && queued_duration_[t] >= formats_[t]->timescale * kFormatPatienceSeconds) return true;
  }
  return false;
}

bool MovieWriter::fragmentDue() const {
  if (!formatsKnown()) return false;
  // Half a second of the leading track. If that stands still the others must not wait for it.
  if (queued_duration_.front() * 2 >= formats_.front()->timescale) return true;
  for (std::size_t t = 1; t < formats_.size(); ++t) {
    if (queued_duration_[t] >= formats_[t]->timescale) return true;
  }
  return false;
}

void MovieWriter::fail(int error) {
  {
    const std::lock_guard lock(mutex_);
    error_ = error;
    changed_.notify_all();
  }
  on_error_(error);
}

void MovieWriter::run() {
  auto lastSync = std::chrono::steady_clock::now();
  for (bool last = false; !last;) {
    const Fragment fragment = takeFragment();
    last = fragment.last;
    if (error_ == 0) writeFragment(fragment.samples);
    const auto now = std::chrono::steady_clock::now();
    if (last || error_ != 0 || now - lastSync < kSyncInterval) continue;
    lastSync = now;
    syncToDisk();
  }
}

/// Waits until a fragment is due or the movie ends.
MovieWriter::Fragment MovieWriter::takeFragment() {
  Fragment fragment;
  std::unique_lock lock(mutex_);
  changed_.wait(lock, [this] { return ending_ || fragmentDue(); });
  fragment.last = ending_;
  fragment.samples.swap(queue_);
  queued_bytes_ = 0;
  queued_duration_.assign(formats_.size(), 0);
  changed_.notify_all();
  return fragment;
}

void MovieWriter::syncToDisk() {
  const int movie = movie_.sync();
  const int journal = journal_.sync();
  const int error = movie != 0 ? movie : journal;
  if (error == 0 || sync_error_ != 0) return;
  sync_error_ = error;
  LMPLogMessage(nullptr, kLogError, "The disk has not kept what was recorded (%s); the recording goes on",
                std::strerror(error));
}

void MovieWriter::writeFragment(const std::vector<EncodedSample>& samples) {
  if (samples.empty()) return;
  int error = 0;
  if (!movie_.begun()) {
    const std::vector<TrackFormat> formats = knownFormats();
    if (formats.empty()) return;  // ended before every track had begun: there is no movie
    error = movie_.begin(formats);
  }
  if (error == 0) error = movie_.append(samples);
  if (error != 0) fail(error);
}

/// The formats of all tracks; empty as long as one is missing.
std::vector<TrackFormat> MovieWriter::knownFormats() {
  std::vector<TrackFormat> formats;
  const std::lock_guard lock(mutex_);
  if (!formatsKnown()) return {};
  for (const auto& format : formats_) formats.push_back(*format);
  formats_used_ = true;
  return formats;
}

int MovieWriter::finish() {
  if (!thread_.joinable()) return error_;
  {
    const std::lock_guard lock(mutex_);
    ending_ = true;
    changed_.notify_all();
  }
  thread_.join();
  if (!movie_.begun()) return error_;
  const int error = movie_.finish();
  return error_ != 0 ? error_.load() : error;
}

}  // namespace lmx
