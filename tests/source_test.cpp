// Where kspdump's captures come from: what is found in which order, what is refused, what is never mistaken.

#include <archive.h>
#include <archive_entry.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <random>

#include "tools/kspdump/source/source.h"

namespace {

namespace fs = std::filesystem;
using namespace kspdump;
using Files = std::vector<std::pair<std::string, std::string>>;

/// A capture, for these tests, begins with "ksp".
bool isCapture(std::span<const unsigned char> bytes) {
  return bytes.size() >= 3 && std::equal(bytes.begin(), bytes.begin() + 3, "ksp");
}

/// Bytes that no compression makes smaller.
std::string noise(size_t size) {
  std::mt19937 engine(static_cast<unsigned>(size));
  std::string bytes = "ksp";
  while (bytes.size() < size) bytes += static_cast<char>(engine());
  return bytes;
}

std::string packed(const Files& files, int (*format)(archive*), int (*filter)(archive*)) {
  std::string bytes(size_t{8} << 20, '\0');
  size_t used = 0;
  archive* const writer = archive_write_new();
  EXPECT_EQ(format(writer), ARCHIVE_OK);
  EXPECT_EQ(filter(writer), ARCHIVE_OK);
  archive_write_set_bytes_in_last_block(writer, 1);
  EXPECT_EQ(archive_write_open_memory(writer, bytes.data(), bytes.size(), &used), ARCHIVE_OK);
  for (const auto& [name, content] : files) {
    archive_entry* const entry = archive_entry_new();
    archive_entry_set_pathname(entry, name.c_str());
    archive_entry_set_perm(entry, 0644);
    archive_entry_set_filetype(entry, name.ends_with('/') ? AE_IFDIR : AE_IFREG);
    if (content.starts_with("->")) {
      archive_entry_set_filetype(entry, AE_IFLNK);
      archive_entry_set_symlink(entry, content.c_str() + 2);
    } else if (!name.ends_with('/')) {
      archive_entry_set_size(entry, static_cast<la_int64_t>(content.size()));
    }
    EXPECT_EQ(archive_write_header(writer, entry), ARCHIVE_OK);
    archive_write_data(writer, content.data(), content.size());
    archive_entry_free(entry);
  }
  EXPECT_EQ(archive_write_close(writer), ARCHIVE_OK);
  archive_write_free(writer);
  bytes.resize(used);
  return bytes;
}

std::string tar(const Files& files) {
  return packed(files, archive_write_set_format_ustar, archive_write_add_filter_none);
}
std::string tarGz(const Files& files) {
  return packed(files, archive_write_set_format_ustar, archive_write_add_filter_gzip);
}
std::string gz(const std::string& bytes) {
  return packed({{"x", bytes}}, archive_write_set_format_raw, archive_write_add_filter_gzip);
}
std::string zip(const Files& files) {
  return packed(files, archive_write_set_format_zip, archive_write_add_filter_none);
}

class SourceTest : public testing::Test {
 protected:
  SourceTest() : folder_(fs::path(testing::TempDir()) / ("source" + std::to_string(getpid()))) {
    fs::create_directories(folder_);
    fs::current_path(folder_);
  }
  ~SourceTest() override { fs::remove_all(folder_); }

  static void write(const fs::path& name, const std::string& bytes) {
    if (name.has_parent_path()) fs::create_directories(name.parent_path());
    std::ofstream(name, std::ios::binary) << bytes;
  }

  /// What a source holds, a line a capture; its bytes where they are short.
  void collect(Source& source, std::string& lines) const {
    for (Input input; source.next(input);) {
      const std::unique_ptr<Source> within = load(input, reading_);
      if (within != nullptr) {
        collect(*within, lines);
        continue;
      }
      const std::span<const unsigned char> bytes = input.bytes;
      lines += input.name;
      if (input.state == Input::State::kPassedOver) lines += " passed over";
      if (input.state == Input::State::kFault) lines += ": " + input.fault;
      if (input.state == Input::State::kRead) {
        lines += bytes.size() < 20 ? "=" + std::string(bytes.begin(), bytes.end())
                                   : " " + std::to_string(bytes.size());
      }
      lines += '\n';
    }
  }

  std::string all(std::vector<std::string> names) const {
    Names source(std::move(names));
    std::string lines;
    collect(source, lines);
    return lines;
  }

  std::string listed(const std::string& list) const {
    write("list", list);
    const std::unique_ptr<Source> source = namesFrom("list");
    std::string lines;
    collect(*source, lines);
    return lines;
  }

  /// The same by way of standard input, from a pipe.
  std::string piped(const std::string& bytes) const {
    int ends[2];
    EXPECT_EQ(pipe(ends), 0);
    const int before = dup(STDIN_FILENO);
    dup2(ends[0], STDIN_FILENO);
    close(ends[0]);
    const pid_t writer = fork();
    if (writer == 0) {
      signal(SIGPIPE, SIG_DFL);
      for (size_t done = 0; done < bytes.size();) {
        done += static_cast<size_t>(::write(ends[1], bytes.data() + done, bytes.size() - done));
      }
      _exit(0);
    }
    close(ends[1]);
    std::string lines = all({"-"});
    dup2(before, STDIN_FILENO);
    close(before);
    return lines;
  }

  const fs::path folder_;
  Reading reading_{.isCapture = isCapture};
};

TEST_F(SourceTest, AFoldersFilesComeInTheOrderOfTheirPaths) {
  write("d/b/2", "ksp2");
  write("d/b/1", "ksp1");
  write("d/b-c", "ksp3");
  write("d/b0", "ksp4");
  write("d/notes", "text");
  write("d/packed.gz", gz("ksp5"));
  write("d/z.tar", tar({{"in/it", "ksp6"}, {"other", "text"}}));
  fs::create_symlink("b0", "d/link");
  fs::create_directory_symlink("..", "d/up");
  ASSERT_EQ(mkfifo("d/pipe", 0600), 0);
  const std::string inside =
      "b-c=ksp3\n%b/1=ksp1\n%b/2=ksp2\n%b0=ksp4\n%link passed over\n%notes passed over\n%packed.gz=ksp5\n"
      "%pipe passed over\n%up passed over\n%z.tar/in/it=ksp6\n%z.tar/other passed over\n";
  const auto below = [&](const std::string& folder) {
    std::string lines = "%" + inside;
    for (size_t at = 0; (at = lines.find('%', at)) != std::string::npos;) lines.replace(at, 1, folder);
    return lines;
  };
  EXPECT_EQ(all({"d"}), below("d/"));
  EXPECT_EQ(all({"d//"}), below("d//"));
  EXPECT_EQ(all({"missing", "d/notes", "d/link"}),
            "missing: No such file or directory\nd/notes=text\nd/link=ksp4\n");
  fs::create_directories("empty/within");
  EXPECT_EQ(all({"empty"}), "");

  reading_.keepsOthers = true;
  EXPECT_EQ(all({"d/z.tar"}), "d/z.tar/in/it=ksp6\nd/z.tar/other=text\n");
  reading_.greatest = 3;
  EXPECT_EQ(all({"d/b0"}), "d/b0: larger than 3 bytes (--max-size)\n");
}

TEST_F(SourceTest, EveryArchiveGivesItsMembers) {
  const std::string large = noise(300000);
  const Files files = {{"./a", "ksp1"},
                       {"b/", ""},
                       {"/b/c", large},
                       {"../d", "ksp2"},
                       {"e", "none"},
                       {"f", "->./a"},
                       {"g", ""},
                       {"h.gz", gz("ksp3")},
                       {"i.tar", tar({{"j", "ksp4"}, {"k.tar", tar({{"l", "ksp5"}})}})}};
  const std::string expected =
      "%/a=ksp1\n%/b/c 300000\n%/../d=ksp2\n%/e passed over\n%/f passed over\n%/g passed over\n%/h.gz=ksp3\n"
      "%/i.tar/j=ksp4\n%/i.tar/k.tar passed over\n";
  const struct {
    int (*format)(archive*);
    int (*filter)(archive*);
  } packings[] = {{archive_write_set_format_ustar, archive_write_add_filter_none},
                  {archive_write_set_format_pax, archive_write_add_filter_none},
                  {archive_write_set_format_gnutar, archive_write_add_filter_gzip},
                  {archive_write_set_format_v7tar, archive_write_add_filter_xz},
                  {archive_write_set_format_ustar, archive_write_add_filter_zstd},
                  {archive_write_set_format_ustar, archive_write_add_filter_bzip2},
                  {archive_write_set_format_zip, archive_write_add_filter_none}};
  for (const auto& [format, filter] : packings) {
    const std::string bytes = packed(files, format, filter);
    const auto named = [&](const std::string& name) {
      std::string lines = expected;
      for (size_t at = 0; (at = lines.find('%', at)) != std::string::npos;) lines.replace(at, 1, name);
      return lines;
    };
    write("bundle", bytes);
    EXPECT_EQ(all({"bundle"}), named("bundle"));
    EXPECT_EQ(piped(bytes), named("-"));
  }
  for (const auto filter : {archive_write_add_filter_gzip, archive_write_add_filter_xz,
                            archive_write_add_filter_zstd, archive_write_add_filter_bzip2}) {
    for (const std::string& content : {large, std::string("no capture"), std::string(5000, '\0')}) {
      const std::string bytes = packed({{"x", content}}, archive_write_set_format_raw, filter);
      const std::string shown = content.size() < 20 ? "=" + content : " " + std::to_string(content.size());
      write("one", bytes);
      EXPECT_EQ(all({"one"}), "one" + shown + "\n");
      EXPECT_EQ(piped(bytes), "-" + shown + "\n");
    }
  }
}

TEST_F(SourceTest, WhatIsNoArchiveIsNeverTakenForOne) {
  using std::string_literals::operator""s;
  const std::string bytesOfCases[] = {"",
                                      "#mtree\n./a type=file\n",
                                      "070707000000000000",
                                      "!<arch>\n",
                                      "7z\xBC\xAF\x27\x1C",
                                      "Rar!\x1A\x07\0"s,
                                      "BZh9 and no block",
                                      std::string(1024, '\0'),
                                      std::string(257, '1') + "ustar" + std::string(300, '1'),
                                      "PK",
                                      "\x1F\x8B"};
  for (const std::string& bytes : bytesOfCases) {
    write("plain", bytes);
    const Input input = loadOne("plain", reading_);
    const std::span<const unsigned char> read = input.bytes;
    EXPECT_EQ(input.state, Input::State::kRead) << bytes;
    EXPECT_EQ(std::string(read.begin(), read.end()), bytes);
  }
  // Even what is one remains a capture where it makes sense as such.
  reading_.isCapture = [](auto bytes) { return bytes.size() > 1 && bytes[0] == 0x1F; };
  write("plain", gz("ksp"));
  EXPECT_NE(all({"plain"}), "plain=ksp\n");
}

TEST_F(SourceTest, DamagedArchivesKeepWhatIsSound) {
  const Files files = {{"a", noise(50000)}, {"b", noise(300000)}, {"c", noise(70000)}};
  const auto startOf = [&](const std::string& bytes) {
    write("x", bytes);
    const std::string lines = all({"x"});
    EXPECT_NE(lines.find("; what follows in the archive is not read\n"), std::string::npos) << lines;
    return lines.substr(0, lines.find('\n') + 1);
  };
  for (const std::string& whole :
       {tar(files), tarGz(files), packed(files, archive_write_set_format_ustar, archive_write_add_filter_xz),
        packed(files, archive_write_set_format_ustar, archive_write_add_filter_zstd)}) {
    EXPECT_EQ(startOf(whole.substr(0, 300000)), "x/a 50000\n");
  }
  std::string broken = tar(files);
  broken[512 + 50176] ^= 1;  // in the second header
  EXPECT_EQ(startOf(broken), "x/a 50000\n");

  broken = zip(files);
  broken[60000] ^= 1;  // in the second member
  write("x", broken);
  EXPECT_EQ(all({"x"}).substr(0, 15), "x/a 50000\nx/b: ");
  EXPECT_NE(all({"x"}).find("\nx/c 70000\n"), std::string::npos) << "the others are sound";

  broken = gz(noise(50000));
  broken[30000] ^= 1;
  write("x", broken);
  EXPECT_EQ(all({"x"}).substr(0, 3), "x: ");
  write("x", "\x1F\x8B\x08rubbish");
  EXPECT_EQ(all({"x"}).substr(0, 3), "x: ");
}

TEST_F(SourceTest, NothingLargerThanTheLimitIsRead) {
  reading_.greatest = 10000;
  const std::string large = "larger than 10000 bytes (--max-size)";
  write("exact", std::string(10000, 'k'));
  write("more", std::string(10001, 'k'));
  EXPECT_EQ(all({"exact", "more", "/dev/zero"}),
            "exact 10000\nmore: " + large + "\n/dev/zero: " + large + "\n");
  EXPECT_EQ(piped(std::string(10000, 'k')), "- 10000\n");
  EXPECT_EQ(piped(std::string(10001, 'k')), "-: " + large + "\n");
  fs::create_directory("d");
  write("d/film", std::string(10001, 'k'));
  write("d/more", "ksp" + std::string(10001, 'k'));
  EXPECT_EQ(all({"d"}), "d/film passed over\nd/more: " + large + "\n");

  const Files files = {{"a", "ksp1"}, {"b", std::string(20000, 'k')}, {"c", "ksp2"}};
  for (const std::string& bytes : {tar(files), zip(files)}) {
    write("x", bytes);
    EXPECT_EQ(all({"x"}), "x/a=ksp1\nx/b: " + large + "\nx/c=ksp2\n");
  }
  write("x", tarGz(files));
  EXPECT_EQ(all({"x"}), "x/a=ksp1\nx/b: " + large + "; what follows in the archive is not read\n");
  write("x", gz(std::string(20000, 'k')));
  EXPECT_EQ(all({"x"}), "x: " + large + "\n");
  write("x", gz(gz(gz("ksp"))));
  EXPECT_EQ(all({"x"}), "x: compressed again and again\n");

  // Small members without end.
  reading_.greatest = 9000;
  write("x", packed(Files(600, {"z", std::string(9000, '\0')}), archive_write_set_format_ustar,
                    archive_write_add_filter_xz));
  const std::string lines = all({"x"});
  EXPECT_NE(lines.find("unpacks to a thousand times its size and more"), std::string::npos)
      << lines.substr(0, 99);
}

TEST_F(SourceTest, AListNamesFiles) {
  using std::string_literals::operator""s;
  write("a", "ksp1");
  write("b\nc", "ksp2");
  EXPECT_EQ(listed("a\0b\nc\0\0missing\0a"s),
            "a=ksp1\nb\nc=ksp2\nlist: its name 3 is empty\nmissing: No such file or directory\na=ksp1\n");
  EXPECT_EQ(listed(""), "");
  EXPECT_EQ(listed("a\nb\n"), "list: its names end with newlines instead of NULs\n");
  EXPECT_EQ(listed(std::string(100000, 'x')), "list: it has no names that end with NULs\n");
  const std::unique_ptr<Source> none = namesFrom("none");
  std::string lines;
  collect(*none, lines);
  EXPECT_EQ(lines, "none: No such file or directory\n");
}

TEST_F(SourceTest, OneCaptureIsOne) {
  write("one.tar", tar({{"readme", "text"}, {"a", "ksp1"}}));
  write("two.tar", tar({{"a", "ksp1"}, {"b", "ksp2"}}));
  write("none.tar", tar({{"readme", "text"}}));
  EXPECT_EQ(loadOne("one.tar", reading_).name, "one.tar/a");
  EXPECT_EQ(loadOne("two.tar", reading_).fault, "holds more than one capture");
  EXPECT_EQ(loadOne("none.tar", reading_).fault, "holds no capture of the kind");
}

}  // namespace
