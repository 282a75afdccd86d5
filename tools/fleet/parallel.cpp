// SPDX-License-Identifier: BSD-2-Clause
#include "fleet/parallel.h"

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <exception>
#include <mutex>
#include <thread>
#include <vector>

namespace fleet {
namespace {

constexpr std::chrono::milliseconds kTick(500);

struct Work {
  const std::function<void(size_t)> &job;
  size_t num_left_to_begin;
  size_t next = 0;
  size_t num_threads;
  std::exception_ptr failure = {};
  std::mutex lock = {};
  std::condition_variable has_ended = {};

  void fail() {
    const std::lock_guard guard(lock);
    if (!failure) failure = std::current_exception();
    num_left_to_begin = 0;
  }

  bool take(size_t *index) {
    const std::lock_guard guard(lock);
    if (num_left_to_begin == 0) return false;
    --num_left_to_begin;
    *index = next++;
    return true;
  }

  void run() {
    for (size_t index; take(&index);) {
      try {
        job(index);
      } catch (...) {
        fail();
      }
    }
    const std::lock_guard guard(lock);
    if (--num_threads == 0) has_ended.notify_all();
  }
};

}  // namespace

void for_each(size_t count, size_t num_threads, const std::function<void(size_t)> &job,
              const std::function<void()> &tick) {
  num_threads = std::max<size_t>(1, std::min(num_threads, count));
  Work work = {.job = job, .num_left_to_begin = count, .num_threads = num_threads};
  {
    std::vector<std::jthread> threads;
    for (size_t i = 0; i < num_threads; ++i) threads.emplace_back([&] { work.run(); });
    std::unique_lock guard(work.lock);
    while (!work.has_ended.wait_for(guard, kTick, [&] { return work.num_threads == 0; })) {
      guard.unlock();
      try {
        tick();
      } catch (...) {
        work.fail();
      }
      guard.lock();
    }
  }
  if (work.failure) std::rethrow_exception(work.failure);
}

}  // namespace fleet
