// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/in_order.h"

#include <sched.h>

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <deque>
#include <exception>
#include <list>
#include <mutex>
#include <new>
#include <optional>
#include <system_error>
#include <thread>
#include <utility>

namespace kspdump {

namespace {

/// Captures are handed out so many bytes at a time, about.
constexpr uint64_t kBatchBytes = uint64_t{1} << 17;

/// Text that may wait for its turn, in all batches.
constexpr size_t kMostWaiting = size_t{8} << 20;

constexpr size_t kBatchesAJob = 4;

/// Ends a thread's work after another one's has failed.
struct Stopped {};

/// What a batch leaves to others when a capture in it turns out to be a source of its own.
class Rest : public Source {
 public:
  explicit Rest(std::vector<Input> inputs) : inputs_(std::move(inputs)) {}

  bool next(Input& input) override {
    if (isOver()) return false;
    std::swap(input, inputs_[at_++]);
    return true;
  }
  [[nodiscard]] bool isOver() const override { return at_ == inputs_.size(); }

 private:
  std::vector<Input> inputs_;
  size_t at_ = 0;
};

}  // namespace

/// A list of what is to come out, in order: batches of captures, and the sources from which batches are put
/// in front of them. Each thread takes a batch from the first source that it can; where a capture of a batch
/// is a folder or an archive, that and the rest of the batch become sources behind it. Only the first batch
/// of the list is written, as it grows; the others wait, with little text.
class InOrder {
 public:
  InOrder(std::unique_ptr<Source> source, const Work& work) : work_(work) {
    nodes_.emplace_back().source = std::move(source);
  }

  void run() {
    try {
      Thread(*this).run();
    } catch (...) {
      fail();
    }
    // Those that still run may have started others.
    for (std::unique_lock lock(mutex_); !threads_.empty(); lock.lock()) {
      std::thread thread = std::move(threads_.front());
      threads_.pop_front();
      lock.unlock();
      thread.join();
    }
    if (failure_ != nullptr) std::rethrow_exception(failure_);
  }

 private:
  /// What is found in a folder or an archive that the user named.
  struct Tally {
    std::string name;
    std::atomic<uint64_t> captures{0};
    std::atomic<uint64_t> passedOver{0};
  };

  /// A source, or a batch.
  struct Node {
    std::unique_ptr<Source> source;
    bool isBusy = false;
    bool isDone = false;
    std::shared_ptr<Tally> tally;
    /// The tally is complete where this one ends.
    bool closesTally = false;
    std::string text;
    std::vector<Lane::Action> actions;
  };
  using At = std::list<Node>::iterator;

  /// One thread's way from batch to batch.
  class Thread {
   public:
    explicit Thread(InOrder& all) : all_(all), show_(all.work_.makeShow(lane_)) {
      lane_.sink.drain = [this](std::string&) { offer(); };
    }

    void run() {
      try {
        while (all_.take(batch_, inputs_, count_)) {
          showBatch();
          all_.finish(batch_, lane_);
        }
      } catch (const Stopped&) {
        return;
      }
    }

   private:
    void showBatch() {
      for (size_t i = 0; i < count_; ++i) {
        Input& input = inputs_[i];
        // One buffer, still in the cache, serves all that are to be read.
        if (input.state == Input::State::kNamed) {
          std::swap(input.bytes, buffer_);
          input.bytes.clear();
        }
        std::unique_ptr<Source> within;
        try {
          within = load(input, all_.work_.reading);
        } catch (const std::bad_alloc&) {
          input.fail("out of memory");
        }
        if (within != nullptr) {
          all_.addSources(batch_, input.name, std::move(within), restFrom(i + 1));
          return;
        }
        if (batch_->tally != nullptr) {
          const bool isOther = input.state == Input::State::kPassedOver;
          ++(isOther ? batch_->tally->passedOver : batch_->tally->captures);
        }
        if (input.state == Input::State::kRead) all_.usualBytes_ = input.bytes.size();
        if (input.state != Input::State::kPassedOver) show_(input);
        std::swap(input.bytes, buffer_);
      }
    }

    std::vector<Input> restFrom(size_t first) {
      const auto at = [&](size_t i) { return inputs_.begin() + static_cast<std::ptrdiff_t>(i); };
      std::vector<Input> rest(std::make_move_iterator(at(first)), std::make_move_iterator(at(count_)));
      return rest;
    }

    void offer() {
      if (all_.first_ == &*batch_) {
        all_.write(lane_.sink.text, lane_.actions_);
      } else if (lane_.sink.text.size() >= kMostWaiting / all_.mostBatches_) {
        all_.waitForTurn(batch_);
        all_.write(lane_.sink.text, lane_.actions_);
      }
    }

    InOrder& all_;
    Lane lane_;
    ShowInput show_;
    At batch_;
    std::vector<Input> inputs_;
    size_t count_ = 0;
    Buffer buffer_;
  };

  /// Puts the next batch into the list, as soon as there is one. Returns false when there will be none.
  bool take(At& batch, std::vector<Input>& inputs, size_t& count) {
    std::unique_lock lock(mutex_);
    At from;
    for (;;) {
      if (failure_ != nullptr) throw Stopped();
      if (nodes_.empty()) return false;
      if (findSource(from)) break;
      changed_.wait(lock);
    }
    if (written_.empty()) written_.emplace_back();
    batch = written_.begin();
    nodes_.splice(from, written_, batch);
    batch->isDone = false;
    batch->tally = from->tally;
    from->isBusy = true;
    noteFirst();
    lock.unlock();

    const bool isOver = fill(*from->source, inputs, count);
    lock.lock();
    from->isBusy = false;
    from->isDone = isOver;
    if (!isOver) startAnother();
    changed_.notify_all();
    return true;
  }

  /// Finds the first source that a batch may be taken from, with not too many batches before it.
  bool findSource(At& found) {
    size_t batches = 0;
    for (At at = nodes_.begin(); at != nodes_.end() && batches < mostBatches_; ++at) {
      if (at->source == nullptr) {
        ++batches;
      } else if (!at->isBusy && !at->isDone) {
        found = at;
        return true;
      }
    }
    return false;
  }

  /// Takes captures from a source. Returns whether these were its last.
  bool fill(Source& source, std::vector<Input>& inputs, size_t& count) const {
    uint64_t bytes = 0;
    for (count = 0; bytes < kBatchBytes; ++count) {
      if (count == inputs.size()) inputs.emplace_back();
      Input& input = inputs[count];
      try {
        if (!source.next(input)) return true;
      } catch (const std::bad_alloc&) {
        input.fail("out of memory");
      }
      // The least of them takes some work, too.
      bytes += sizeof input + (input.state == Input::State::kNamed ? usualBytes_.load() : input.bytes.size());
    }
    return source.isOver();
  }

  /// A thread more, where there is room for it; called with the lock held.
  void startAnother() {
    if (spare_ == 0) return;
    try {
      threads_.emplace_back([this] { runBeside(); });
      --spare_;
    } catch (const std::exception&) {
      spare_ = 0;  // those that there are do it
    }
  }

  void runBeside() {
    try {
      std::optional<Thread> thread;
      try {
        thread.emplace(*this);
      } catch (const std::bad_alloc&) {
        return;  // the others do without it
      }
      thread->run();
    } catch (...) {
      fail();
    }
  }

  void addSources(At batch, const std::string& name, std::unique_ptr<Source> within,
                  std::vector<Input> rest) {
    const std::lock_guard lock(mutex_);
    const At behind = std::next(batch);
    Node& inner = *nodes_.emplace(behind);
    inner.source = std::move(within);
    inner.tally = batch->tally;
    if (inner.tally == nullptr) {
      inner.tally = std::make_shared<Tally>();
      inner.tally->name = name;
      inner.closesTally = true;
    }
    if (!rest.empty()) {
      Node& others = *nodes_.emplace(behind);
      others.source = std::make_unique<Rest>(std::move(rest));
      others.tally = batch->tally;
    }
    changed_.notify_all();
  }

  void waitForTurn(At batch) {
    std::unique_lock lock(mutex_);
    changed_.wait(lock, [&] { return failure_ != nullptr || first_ == &*batch; });
    if (failure_ != nullptr) throw Stopped();
  }

  void finish(At batch, Lane& lane) {
    std::unique_lock lock(mutex_);
    if (first_ == &*batch) {
      lock.unlock();
      write(lane.sink.text, lane.actions_);
      lock.lock();
    } else {
      std::swap(batch->text, lane.sink.text);
      std::swap(batch->actions, lane.actions_);
    }
    batch->isDone = true;
    // Whoever takes the first one from the list writes what waits behind it.
    if (isWriting_) return;
    isWriting_ = true;
    while (!nodes_.empty() && nodes_.front().isDone && failure_ == nullptr) {
      const At front = nodes_.begin();
      lock.unlock();
      write(front->text, front->actions);
      if (front->closesTally) {
        work_.found({front->tally->name, front->tally->captures, front->tally->passedOver});
      }
      lock.lock();
      if (front->source == nullptr) {
        written_.splice(written_.begin(), nodes_, front);
      } else {
        nodes_.erase(front);
      }
      noteFirst();
      changed_.notify_all();
    }
    isWriting_ = false;
  }

  /// Writes what is first in order.
  void write(std::string& text, std::vector<Lane::Action>& actions) {
    size_t at = 0;
    const std::string_view all = text;
    for (const Lane::Action& action : actions) {
      if (action.at != at) work_.write(all.substr(at, action.at - at));
      at = action.at;
      action.run();
    }
    if (at != all.size()) work_.write(all.substr(at));
    text.clear();
    actions.clear();
  }

  void noteFirst() { first_ = nodes_.empty() ? nullptr : &nodes_.front(); }

  void fail() {
    const std::lock_guard lock(mutex_);
    if (failure_ == nullptr) failure_ = std::current_exception();
    changed_.notify_all();
  }

  const Work& work_;
  const size_t mostBatches_ = kBatchesAJob * work_.jobs;
  /// Threads that may still be started.
  size_t spare_ = work_.jobs - 1;
  std::mutex mutex_;
  std::condition_variable changed_;
  std::list<Node> nodes_;
  /// Batches that are over, kept for the room that their texts have.
  std::list<Node> written_;
  std::atomic<const Node*> first_ = nullptr;
  /// Files that are still to be read are taken to be like the last that was.
  std::atomic<uint64_t> usualBytes_ = kBatchBytes;
  bool isWriting_ = false;
  std::exception_ptr failure_;
  std::deque<std::thread> threads_;
};

void showInOrder(std::unique_ptr<Source> source, const Work& work) {
  InOrder(std::move(source), work).run();
}

size_t usableCores() {
  cpu_set_t cores;
  if (sched_getaffinity(0, sizeof cores, &cores) == 0) return static_cast<size_t>(CPU_COUNT(&cores));
  return std::max(1U, std::thread::hardware_concurrency());
}

}  // namespace kspdump
