// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

/// A test with a folder of its own, which goes with it.
class FolderTest : public testing::Test {
 protected:
  FolderTest() { std::filesystem::create_directories(folder_); }
  ~FolderTest() override { std::filesystem::remove_all(folder_); }

  std::string path(const std::string& name) const { return folder_ / name; }

  /// Writes a file of one line, and the folders that it is in.
  void write(const std::string& name, const std::string& text) const {
    std::filesystem::create_directories((folder_ / name).parent_path());
    std::ofstream(folder_ / name) << text << '\n';
  }

  static std::string textOf(const std::filesystem::path& file) {
    std::stringstream text;
    text << std::ifstream(file).rdbuf();
    return text.str();
  }

  std::string read(const std::string& name) const { return textOf(folder_ / name); }

  const std::filesystem::path folder_ =
      std::filesystem::path(testing::TempDir()) / ("ksp-test" + std::to_string(getpid()));
};
