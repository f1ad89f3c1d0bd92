// Frame-parallel processing in order: one thread reads, N workers each transform whole frames
// with state of their own (a chain of filter objects), and the calling thread writes the results
// in the order they were read. Frames in flight are bounded, so memory stays flat however far
// the workers run ahead of a slow writer.
#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <thread>
#include <utility>
#include <vector>

#include "Status.h"

namespace tfxtool {

template <class Frame>
class FramePipeline {
 public:
  // Called on the reader thread: fills *frame, or sets *end at the end of the input.
  using ReadFn = std::function<Status(Frame* frame, bool* end)>;
  // Called on worker `worker` (0..workers-1), never on two threads for the same worker.
  using WorkFn = std::function<Status(int worker, Frame& frame)>;
  // Called on the calling thread, frame after frame in reading order.
  using WriteFn = std::function<Status(Frame& frame)>;

  // Runs to the end of the input, to the first failure (whose status it returns; the other
  // threads stop at their next frame), or until *cancel becomes true (then Ok, and the caller
  // knows it cancelled). `workers` below 1 counts as 1.
  static Status Run(int workers, const ReadFn& read, const WorkFn& work, const WriteFn& write,
                    const std::atomic<bool>* cancel = nullptr) {
    FramePipeline p(workers < 1 ? 1 : workers, cancel);
    return p.Go(read, work, write);
  }

 private:
  FramePipeline(int workers, const std::atomic<bool>* cancel)
      : workers_(workers), inFlightLimit_(static_cast<size_t>(workers) * 2 + 2), cancel_(cancel) {}

  bool Stopping() const { return stop_ || (cancel_ && cancel_->load()); }

  // A cancel request comes from a signal handler, which cannot notify, so waits look up now and
  // then.
  template <class Pred>
  void WaitUntil(std::unique_lock<std::mutex>& lock, Pred pred) {
    while (!pred()) changed_.wait_for(lock, std::chrono::milliseconds(50));
  }

  void Fail(Status st) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (!failure_) failure_ = std::move(st);
    stop_ = true;
    changed_.notify_all();
  }

  void Reader(const ReadFn& read) {
    for (int64_t seq = 0;; ++seq) {
      {
        std::unique_lock<std::mutex> lock(mutex_);
        WaitUntil(lock, [&] { return Stopping() || inFlight_ < inFlightLimit_; });
        if (Stopping()) break;
        ++inFlight_;
      }
      Frame frame;
      bool end = false;
      if (Status st = read(&frame, &end); !st.ok()) {
        Fail(std::move(st));
        break;
      }
      std::lock_guard<std::mutex> lock(mutex_);
      if (end) {
        --inFlight_;
        total_ = seq;
        changed_.notify_all();
        break;
      }
      todo_.emplace_back(seq, std::move(frame));
      changed_.notify_all();
    }
    std::lock_guard<std::mutex> lock(mutex_);
    readerDone_ = true;
    changed_.notify_all();
  }

  void Worker(int index, const WorkFn& work) {
    for (;;) {
      std::pair<int64_t, Frame> item;
      {
        std::unique_lock<std::mutex> lock(mutex_);
        WaitUntil(lock, [&] { return Stopping() || !todo_.empty() || readerDone_; });
        if (Stopping() || todo_.empty()) return;
        item = std::move(todo_.front());
        todo_.pop_front();
      }
      if (Status st = work(index, item.second); !st.ok()) {
        Fail(std::move(st));
        return;
      }
      std::lock_guard<std::mutex> lock(mutex_);
      done_.emplace(item.first, std::move(item.second));
      changed_.notify_all();
    }
  }

  Status Go(const ReadFn& read, const WorkFn& work, const WriteFn& write) {
    std::vector<std::thread> threads;
    threads.emplace_back([&] { Reader(read); });
    for (int w = 0; w < workers_; ++w) threads.emplace_back([&, w] { Worker(w, work); });
    for (int64_t next = 0;; ++next) {
      Frame frame;
      {
        std::unique_lock<std::mutex> lock(mutex_);
        WaitUntil(lock, [&] {
          return Stopping() || done_.count(next) || (total_ >= 0 && next >= total_);
        });
        if (Stopping() || (total_ >= 0 && next >= total_)) break;
        auto it = done_.find(next);
        frame = std::move(it->second);
        done_.erase(it);
      }
      Status st = write(frame);
      std::lock_guard<std::mutex> lock(mutex_);
      --inFlight_;
      changed_.notify_all();
      if (!st.ok()) {
        if (!failure_) failure_ = std::move(st);
        stop_ = true;
        break;
      }
    }
    {
      std::lock_guard<std::mutex> lock(mutex_);
      stop_ = true;
      changed_.notify_all();
    }
    for (auto& t : threads) t.join();
    return failure_ ? *failure_ : Status::Ok();
  }

  const int workers_;
  const size_t inFlightLimit_;
  const std::atomic<bool>* cancel_;
  std::mutex mutex_;
  std::condition_variable changed_;
  std::deque<std::pair<int64_t, Frame>> todo_;
  std::map<int64_t, Frame> done_;
  size_t inFlight_ = 0;
  int64_t total_ = -1;  // frames read, once the reader has met the end
  bool readerDone_ = false;
  bool stop_ = false;
  std::optional<Status> failure_;
};

}  // namespace tfxtool
