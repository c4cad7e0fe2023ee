// A step of a job: what is asked for, and, once the job's files have been looked at, the file that all handsets share.
#ifndef KRAL_STATION_STEP_H
#define KRAL_STATION_STEP_H

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "base/utf8_text.h"
#include "download/images/image_file.h"
#include "download/images/phone_image.h"
#include "download/kova/kova.h"
#include "storage/pkv/pkv_set.h"

namespace kral::station {

enum class StepKind : uint8_t {
  kIdentity,
  kEnterLoader,
  kProgrammer,
  kPartitionTable,
  kImage,
  kReset,
  kMode,
  kRestore,
  kVerify,
};

// An image with the header of its opening packet.
struct OpenedImage {
  images::ImageFile image;
  images::ImageFile header;
  bool has_header = false;
};

struct Step {
  StepKind kind;
  std::string file = {};
  std::string header_file = {};
  bool has_header = false;
  bool asked_for = true;  // not one that the options or the job itself add
  uint32_t number = 0;    // kind of the programmer, format of the image, mode; whether a table overrides
  uint8_t image_type = 0;
  uint8_t method = 0;

  std::string name = {};  // for people, once it is planned
  uint64_t bytes = 0;     // that go into the handset's memory or flash

  // What the file is made of: the one of these that the kind needs. Read by several threads at once.
  std::shared_ptr<const images::PhoneImage> boot = {};
  std::shared_ptr<const kova::ProgrammerFile> hex = {};
  std::shared_ptr<const std::vector<uint8_t>> table = {};
  std::shared_ptr<const OpenedImage> image = {};
  std::shared_ptr<const pkv::PkvSet> set = {};
};

// A text as it fits into a field of a record: terminated, and fit for a terminal.
template <size_t kSize>
void PutText(char (&field)[kSize], const std::string& text) {
  std::snprintf(field, kSize, "%s", text.c_str());
  MakePrintableUtf8(field);
}

using Plan = std::vector<Step>;

}  // namespace kral::station

#endif
