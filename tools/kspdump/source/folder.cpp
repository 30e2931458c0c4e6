// SPDX-License-Identifier: Apache-2.0
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <optional>
#include <system_error>
#include <utility>

#include "tools/kspdump/source/stream.h"

namespace kspdump {

namespace {

/// The files below a folder, in the order of their paths. Links are not followed, so that nothing comes twice
/// and no loop is run through.
class Folder : public Source {
 public:
  Folder(std::string path, std::string name) : waiting_{{std::move(path), std::move(name)}} {}

  bool next(Input& input) override {
    for (;;) {
      if (waiting_) {
        const auto [path, name] = *std::exchange(waiting_, std::nullopt);
        const int error = enter(path, name);
        if (error == 0) continue;
        start(input, path, name);
        input.fail(std::generic_category().message(error));
        return true;
      }
      if (levels_.empty()) return false;
      Level& level = levels_.back();
      if (level.left.empty()) {
        levels_.pop_back();
        continue;
      }
      const Item item = std::move(level.left.back());
      level.left.pop_back();
      std::string path = level.path + item.name;
      std::string name = level.name + item.name;
      if (item.type == Type::kFolder) {
        waiting_ = {std::move(path), std::move(name)};
        continue;
      }
      start(input, std::move(path), std::move(name));
      if (item.type == Type::kOther) input.state = Input::State::kPassedOver;
      return true;
    }
  }

 private:
  enum class Type { kFile, kFolder, kOther };

  struct Item {
    /// With a slash behind a folder's, so that sorted names give sorted paths.
    std::string name;
    Type type;
  };

  struct Level {
    /// Both with a slash behind.
    std::string path;
    std::string name;
    dev_t device;
    ino_t number;
    /// The next one last.
    std::vector<Item> left;
  };

  static void start(Input& input, std::string path, std::string name) {
    input.reset();
    input.path = std::move(path);
    input.name = std::move(name);
    input.isFound = true;
  }

  static std::string withSlash(const std::string& path) { return path.ends_with('/') ? path : path + '/'; }

  /// Not every file system tells it in the entry itself.
  static Type typeOf(int folder, const dirent& entry) {
    struct stat status = {};
    fstatat(folder, entry.d_name, &status, AT_SYMLINK_NOFOLLOW);
    return S_ISREG(status.st_mode) ? Type::kFile : S_ISDIR(status.st_mode) ? Type::kFolder : Type::kOther;
  }

  /// Returns 0, or the error number of why the folder cannot be read.
  int enter(const std::string& path, const std::string& name) {
    const bool isRoot = levels_.empty();
    const int descriptor =
        open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC | (isRoot ? 0 : O_NOFOLLOW | O_NONBLOCK));
    if (descriptor == -1) return errno;
    const std::unique_ptr<DIR, int (*)(DIR*)> folder(fdopendir(descriptor), closedir);
    struct stat status = {};
    if (folder == nullptr || fstat(descriptor, &status) != 0) return errno;
    // A folder that is mounted within itself.
    for (const Level& level : levels_) {
      if (level.device == status.st_dev && level.number == status.st_ino) return ELOOP;
    }
    Level level = {withSlash(path), withSlash(name), status.st_dev, status.st_ino, {}};
    for (errno = 0; const dirent* const entry = readdir(folder.get()); errno = 0) {
      const std::string_view item = entry->d_name;
      if (item == "." || item == "..") continue;
      const Type type = typeOf(descriptor, *entry);
      level.left.push_back({std::string(item) + (type == Type::kFolder ? "/" : ""), type});
    }
    const int error = errno;
    std::sort(level.left.begin(), level.left.end(),
              [](const Item& a, const Item& b) { return a.name > b.name; });
    levels_.push_back(std::move(level));
    return error;
  }

  std::optional<std::pair<std::string, std::string>> waiting_;
  std::vector<Level> levels_;
};

}  // namespace

std::unique_ptr<Source> folderSource(const Input& input) {
  return std::make_unique<Folder>(input.path, input.name);
}

}  // namespace kspdump
