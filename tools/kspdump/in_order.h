#pragma once

#include <condition_variable>
#include <cstddef>
#include <exception>
#include <mutex>
#include <optional>
#include <thread>
#include <vector>

namespace kspdump {

/// Computes `make(0)` to `make(count - 1)` on `jobs` threads and hands the results to `take(index, result)`
/// on this one, in order. Only a few results are held at a time. What `make` or `take` throws is thrown from
/// here.
template <class Make, class Take>
void inOrder(size_t count, size_t jobs, Make make, Take take) {
  using Result = decltype(make(size_t{}));
  const size_t window = 4 * jobs;
  std::vector<std::optional<Result>> results(window);
  std::mutex mutex;
  std::condition_variable changed;
  std::exception_ptr failure;
  size_t next = 0;
  size_t taken = 0;

  const auto work = [&] {
    std::unique_lock lock(mutex);
    for (;;) {
      changed.wait(lock, [&] { return failure != nullptr || next == count || next < taken + window; });
      if (failure != nullptr || next == count) return;
      const size_t index = next++;
      lock.unlock();
      std::optional<Result> result;
      std::exception_ptr thrown;
      try {
        result.emplace(make(index));
      } catch (...) {
        thrown = std::current_exception();
      }
      lock.lock();
      if (thrown != nullptr) {
        failure = thrown;
      } else {
        results[index % window] = std::move(result);
      }
      changed.notify_all();
    }
  };

  std::vector<std::jthread> workers;
  for (size_t i = 0; i < jobs; ++i) workers.emplace_back(work);
  std::unique_lock lock(mutex);
  try {
    while (taken < count) {
      std::optional<Result>& slot = results[taken % window];
      changed.wait(lock, [&] { return failure != nullptr || slot.has_value(); });
      if (failure != nullptr) break;
      Result result = std::move(*slot);
      slot.reset();
      lock.unlock();
      take(taken, result);
      lock.lock();
      ++taken;
      changed.notify_all();
    }
  } catch (...) {
    if (!lock.owns_lock()) lock.lock();
    failure = std::current_exception();
    changed.notify_all();
  }
  lock.unlock();
  workers.clear();
  if (failure != nullptr) std::rethrow_exception(failure);
}

}  // namespace kspdump
