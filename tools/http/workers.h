// SPDX-License-Identifier: BSD-2-Clause
/// Threads that run what is submitted, in its order.
#ifndef HTTP_WORKERS_H
#define HTTP_WORKERS_H

#include <condition_variable>
#include <deque>
#include <functional>
#include <mutex>
#include <thread>
#include <utility>
#include <vector>

namespace http {

class Workers {
 public:
  using Job = std::function<void()>;  // must not throw

  explicit Workers(size_t num_threads) {
    for (size_t i = 0; i < num_threads; ++i) threads_.emplace_back([this] { work(); });
  }
  ~Workers() { finish(); }
  Workers(const Workers &) = delete;
  Workers &operator=(const Workers &) = delete;

  void submit(Job job) {
    const std::lock_guard guard(lock_);
    jobs_.push_back(std::move(job));
    has_changed_.notify_one();
  }

  /// Returns when the jobs are done. Nothing can be submitted afterwards.
  void finish() {
    {
      const std::lock_guard guard(lock_);
      is_ending_ = true;
      has_changed_.notify_all();
    }
    threads_.clear();
  }

 private:
  void work() {
    std::unique_lock lock(lock_);
    for (;;) {
      has_changed_.wait(lock, [this] { return is_ending_ || !jobs_.empty(); });
      if (jobs_.empty()) return;
      const Job job = std::exchange(jobs_.front(), nullptr);
      jobs_.pop_front();
      lock.unlock();
      job();
      lock.lock();
    }
  }

  std::mutex lock_;  // of the next three
  std::condition_variable has_changed_;
  std::deque<Job> jobs_;
  bool is_ending_ = false;
  std::vector<std::jthread> threads_;
};

}  // namespace http

#endif
