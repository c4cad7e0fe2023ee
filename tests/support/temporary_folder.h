// A folder of a test's own, removed with everything in it.
#ifndef KRAL_TESTS_SUPPORT_TEMPORARY_FOLDER_H
#define KRAL_TESTS_SUPPORT_TEMPORARY_FOLDER_H

#include <filesystem>
#include <fstream>
#include <random>
#include <string>
#include <string_view>
#include <vector>

namespace kral::test {

class TemporaryFolder {
 public:
  TemporaryFolder()
      : path_(std::filesystem::temp_directory_path() / ("kral_test_" + std::to_string(std::random_device{}()))) {
    std::filesystem::create_directories(path_);
  }
  ~TemporaryFolder() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  TemporaryFolder(const TemporaryFolder&) = delete;
  TemporaryFolder& operator=(const TemporaryFolder&) = delete;

  std::filesystem::path path() const { return path_; }
  std::string File(std::string_view name) const { return (path_ / name).string(); }

  void Write(std::string_view name, std::string_view text) const {
    std::ofstream(File(name), std::ios::binary) << text;
  }

  // The lines of a text file; none when it does not exist.
  std::vector<std::string> Lines(std::string_view name) const {
    std::ifstream file(File(name));
    std::vector<std::string> lines;
    for (std::string line; std::getline(file, line);) lines.push_back(line);
    return lines;
  }

 private:
  std::filesystem::path path_;
};

}  // namespace kral::test

#endif
