// Any bytes as a PKV file: the compound document around it, the records in it, and the library's own iterator over
// them. What was accepted must come out of either writer, and in again, the same.
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <random>
#include <string>

#include "fuzz/support.h"
#include "storage/pkv/pkv_set.h"
#include "storage/pkv/varn_pkv_file.h"

namespace {

using namespace kral;
using fuzz::Require;

// A file of this process alone.
std::string FileName(const char* name) {
  static const std::string prefix =
      (std::filesystem::temp_directory_path() / ("kral-fuzz-" + std::to_string(std::random_device()()))).string();
  return prefix + name;
}

struct Removed {
  ~Removed() {
    std::error_code ignored;
    std::filesystem::remove(path, ignored);
  }
  std::string path;
};

void Walk(const std::string& path) {
  pkv::VARN_PkvFile file;
  try {
    file.open(path);
    for (auto item = file.begin(); item != file.end(); item++) {
      const pkv::VARN_PkvFile::NvItem copy = *item;  // reads every byte of it
      Require(copy == *item);
    }
  } catch (const pkv::VARN_PkvFile::Exception&) {
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const Removed input{FileName(".pkv")};
  std::ofstream(input.path, std::ios::binary)
      .write(reinterpret_cast<const char*>(data), static_cast<std::streamsize>(size));
  Walk(input.path);
  pkv::PkvSet set;
  const pkv::PkvOutcome outcome = pkv::ReadPkv(input.path, set);
  Require(outcome.done() == outcome.text.empty());
  if (!outcome.done()) return 0;
  for (const pkv::PkvWriter writer : {pkv::PkvWriter::kStorageClasses, pkv::PkvWriter::kVarnPkvFile}) {
    if (set.items.empty() && writer == pkv::PkvWriter::kVarnPkvFile) continue;  // which refuses sets without items
    const Removed copy{FileName("-copy.pkv")};
    const pkv::PkvOutcome written = pkv::WritePkv(copy.path, set, nullptr, writer);
    pkv::PkvSet again;
    Require(written.done() && pkv::ReadPkv(copy.path, again).done());
    Require(again.items == set.items);
    Require(again.files == set.files);
  }
  return 0;
}
