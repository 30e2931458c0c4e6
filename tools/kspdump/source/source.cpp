// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/source/source.h"

#include <algorithm>

#include "tools/kspdump/source/stream.h"

namespace kspdump {

namespace {

/// Archives within each other that are opened, and compressions around each other that are undone.
constexpr unsigned kMostNested = 2;

/// Reads the first bytes of a stream: a block of them if there are.
void readHead(Stream& stream, Buffer& bytes) {
  const uint64_t size = stream.size();
  const size_t head = size == 0 ? kBlockBytes : static_cast<size_t>(std::min<uint64_t>(size, kBlockBytes));
  while (bytes.size() < head) {
    const size_t count = head - bytes.size();
    const size_t got = stream.read(bytes.room(count), count);
    if (got == 0) return;
    bytes.added(got);
  }
}

/// A stream that could be read up to here.
class Broken : public Stream {
 public:
  explicit Broken(std::string why) : why_(std::move(why)) {}
  size_t read(unsigned char* /*out*/, size_t /*size*/) override { throw ReadFault(why_); }

 private:
  std::string why_;
};

/// Whether bytes are a capture. Most are one from their first bytes on, and then no more of them are looked
/// at.
bool isCapture(std::span<const unsigned char> bytes, const Reading& reading) {
  constexpr size_t kFirst = 2048;
  return (bytes.size() > kFirst && reading.isCapture(bytes.first(kFirst))) || reading.isCapture(bytes);
}

/// What a stream that begins so is, where it is no capture.
Packing packingOfOther(std::span<const unsigned char> head, const Reading& reading) {
  const Packing packing = packingOf(head);
  return packing == Packing::kNone || reading.isCapture(head) ? Packing::kNone : packing;
}

/// Undoes a stream's packing: an archive's members are returned, a capture is read.
std::unique_ptr<Source> unpack(Input& input, std::unique_ptr<Stream> stream, Packing packing,
                               const Reading& reading) {
  for (unsigned layer = 0; packing != Packing::kNone; ++layer) {
    if (packing == Packing::kTar || packing == Packing::kZip) {
      return archiveSource(input, std::move(stream), packing, reading);
    }
    if (layer == kMostNested) throw ReadFault("compressed again and again");
    stream = unpacked(std::move(stream), packing, reading.greatest);
    Buffer head;
    try {
      readHead(*stream, head);
    } catch (const ReadFault& fault) {
      // What was sound up to there may be an archive's members.
      stream = std::make_unique<Broken>(fault.what());
    }
    packing = packingOfOther(head, reading);
    stream = std::make_unique<Rejoined>(std::move(head), std::move(stream));
  }
  readAll(*stream, reading.greatest, input.bytes);
  input.state = Input::State::kRead;
  return nullptr;
}

std::unique_ptr<Source> openInput(Input& input, const Reading& reading) {
  std::unique_ptr<File> file = openFile(input.path, input.isFound);
  if (input.isFound && !file->isRegular()) {
    input.state = Input::State::kPassedOver;
    return nullptr;
  }
  if (file->isFolder() && input.path != "-") return folderSource(input);
  const uint64_t size = file->size();
  readHead(*file, input.bytes);
  const Packing packing = packingOfOther(input.bytes, reading);
  if (packing != Packing::kNone) {
    // From the start again where that is possible: then the archive can be gone about in.
    if (!file->seek(0)) {
      return unpack(input, std::make_unique<Rejoined>(std::move(input.bytes), std::move(file)), packing,
                    reading);
    }
    input.bytes.clear();
    return unpack(input, std::move(file), packing, reading);
  }
  if (size > reading.greatest && input.isFound && !reading.keepsOthers && !reading.isCapture(input.bytes)) {
    input.state = Input::State::kPassedOver;
    return nullptr;
  }
  readAll(*file, reading.greatest, input.bytes);
  input.state = Input::State::kRead;
  return nullptr;
}

/// The names in a list.
class NameList : public Source {
 public:
  explicit NameList(std::string list) : list_(std::move(list)) {}

  bool next(Input& input) override {
    input.reset();
    if (isOver_) return false;
    try {
      if (file_ == nullptr) {
        isOver_ = true;  // unless it can be opened and read
        file_ = openFile(list_, false);
      }
      std::string name;
      if (!take(name)) return false;
      ++count_;
      if (name.empty()) throw ReadFault("its name " + std::to_string(count_) + " is empty");
      input.name = input.path = name;
      if (name == "-" && list_ == "-") input.fail("standard input is the list of names");
    } catch (const ReadFault& fault) {
      // A name that is empty stops no other.
      input.name = list_;
      input.fail(fault.what());
    }
    return true;
  }

 private:
  /// Takes the next name. Returns false behind the last.
  bool take(std::string& name) {
    for (;;) {
      const unsigned char* const last = chunk_.data() + chunk_.size();
      const unsigned char* const end = std::find(at_, last, '\0');
      name.append(at_, end);
      at_ = end;
      if (end != last) {
        ++at_;
        return true;
      }
      isOver_ = true;  // unless more can be read
      if (name.size() > kBlockBytes) throw ReadFault("it has no names that end with NULs");
      chunk_.clear();
      chunk_.added(file_->read(chunk_.room(kBlockBytes), kBlockBytes));
      at_ = chunk_.data();
      if (chunk_.size() != 0) {
        isOver_ = false;
        continue;
      }
      if (count_ == 0 && name.find('\n') != std::string::npos) {
        throw ReadFault("its names end with newlines instead of NULs");
      }
      return !name.empty();
    }
  }

  std::string list_;
  std::unique_ptr<File> file_;
  Buffer chunk_;
  /// What of it is still to be taken.
  const unsigned char* at_ = nullptr;
  uint64_t count_ = 0;
  bool isOver_ = false;
};

class Joined : public Source {
 public:
  explicit Joined(std::vector<std::unique_ptr<Source>> sources) : sources_(std::move(sources)) {}

  bool next(Input& input) override {
    for (; at_ < sources_.size(); ++at_) {
      if (sources_[at_]->next(input)) return true;
    }
    return false;
  }
  [[nodiscard]] bool isOver() const override {
    return at_ == sources_.size() || (at_ + 1 == sources_.size() && sources_[at_]->isOver());
  }

 private:
  std::vector<std::unique_ptr<Source>> sources_;
  size_t at_ = 0;
};

}  // namespace

std::unique_ptr<Source> joined(std::vector<std::unique_ptr<Source>> sources) {
  return std::make_unique<Joined>(std::move(sources));
}

void Input::reset() {
  Buffer kept = std::move(bytes);
  kept.clear();
  *this = {};
  bytes = std::move(kept);
}

bool Names::next(Input& input) {
  input.reset();
  if (at_ == paths_.size()) return false;
  input.path = paths_[at_++];
  input.name = input.path == "-" ? label_ : input.path;
  return true;
}

std::unique_ptr<Source> namesFrom(const std::string& list) {
  return std::make_unique<NameList>(list);
}

std::unique_ptr<Source> load(Input& input, const Reading& reading) {
  using State = Input::State;
  try {
    std::unique_ptr<Source> within;
    if (input.state == State::kNamed) {
      within = openInput(input, reading);
    } else if (input.state == State::kRead && input.depth < kMostNested) {
      const Packing packing = packingOfOther(input.bytes, reading);
      if (packing != Packing::kNone) {
        within = unpack(input, std::make_unique<Rejoined>(std::move(input.bytes), nullptr), packing, reading);
      }
    }
    if (within != nullptr) return within;
    if (input.state == State::kRead && input.isFound && !reading.keepsOthers &&
        !isCapture(input.bytes, reading)) {
      input.state = State::kPassedOver;
    }
  } catch (const ReadFault& fault) {
    input.fail(fault.what());
  }
  return nullptr;
}

Input loadOne(const std::string& path, const Reading& reading) {
  Input input;
  input.name = input.path = path;
  std::unique_ptr<Source> source = load(input, reading);
  if (source == nullptr) return input;
  Input one;
  bool hasOne = false;
  for (Input each; source->next(each);) {
    const std::unique_ptr<Source> within = load(each, reading);
    if (each.state == Input::State::kPassedOver && within == nullptr) continue;
    if (hasOne || within != nullptr) {
      input.fail("holds more than one capture");
      return input;
    }
    hasOne = true;
    one = std::move(each);
  }
  if (hasOne) return one;
  input.fail("holds no capture of the kind");
  return input;
}

std::string readFile(const std::string& path, Buffer& bytes, const Reading& reading) {
  Input input = loadOne(path, reading);
  bytes = std::move(input.bytes);
  return input.fault;
}

}  // namespace kspdump
