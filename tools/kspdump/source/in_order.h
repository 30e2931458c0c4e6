#pragma once

#include <condition_variable>
#include <cstddef>
#include <exception>
#include <mutex>
#include <system_error>
#include <thread>
#include <vector>

namespace kspdump {

/// Fills results `0` to `count - 1` by `make(index, result)` on `jobs` threads and hands them to
/// `take(index, result)` on this one, in order; where the system has no more threads, on fewer. The results
/// are few and used again and again, so what one has allocated serves the next. What `make` or `take` throws
/// is thrown from here.
template <class Result, class Make, class Take>
void inOrder(size_t count, size_t jobs, Make make, Take take) {
  struct Slot {
    Result result;
    bool isFilled = false;
  };
  std::vector<Slot> slots(jobs == 1 ? 1 : 4 * jobs);
  const auto alone = [&] {
    for (size_t index = 0; index < count; ++index) {
      make(index, slots[0].result);
      take(index, slots[0].result);
    }
  };
  if (jobs == 1) return alone();

  std::mutex mutex;
  std::condition_variable changed;
  std::exception_ptr failure;
  size_t next = 0;
  size_t taken = 0;
  // Calls `step` without the lock; what it throws ends all threads' work.
  const auto unlocked = [&](std::unique_lock<std::mutex>& lock, const auto& step) {
    lock.unlock();
    std::exception_ptr thrown;
    try {
      step();
    } catch (...) {
      thrown = std::current_exception();
    }
    lock.lock();
    if (thrown != nullptr) failure = thrown;
    changed.notify_all();
  };
  const auto work = [&] {
    std::unique_lock lock(mutex);
    for (;;) {
      changed.wait(lock, [&] { return failure != nullptr || next == count || next < taken + slots.size(); });
      if (failure != nullptr || next == count) return;
      const size_t index = next++;
      Slot& slot = slots[index % slots.size()];
      unlocked(lock, [&] { make(index, slot.result); });
      slot.isFilled = true;
    }
  };

  std::vector<std::jthread> workers;
  try {
    for (size_t i = 0; i < jobs; ++i) workers.emplace_back(work);
  } catch (const std::system_error&) {
    if (workers.empty()) return alone();
  }
  std::unique_lock lock(mutex);
  while (taken < count) {
    Slot& slot = slots[taken % slots.size()];
    changed.wait(lock, [&] { return failure != nullptr || slot.isFilled; });
    if (failure != nullptr) break;
    unlocked(lock, [&] { take(taken, slot.result); });
    slot.isFilled = false;
    ++taken;
    changed.notify_all();
  }
  lock.unlock();
  workers.clear();
  if (failure != nullptr) std::rethrow_exception(failure);
}

}  // namespace kspdump
