// Reads image files through the library and refuses those that a download could not write.
#include "tools/kral/flash/flash_images.h"

#include <algorithm>
#include <charconv>
#include <optional>
#include <system_error>

#include "platform/file_util.h"
#include "tools/kral/call_failure.h"
#include "tools/kral/format.h"
#include "tools/kral/progress.h"

namespace kral::tool {
namespace {

constexpr std::uint32_t kLargestProgrammer = 500 * 1024;
constexpr std::uint32_t kNoStart = 0xFFFFFFFF;

ToolError BadImage(const std::string& file, std::string_view why, std::string hint,
                   const std::optional<KRAL_ERROR>& record = {}) {
  return {ExitCode::kBadFile, Format("{}: {}", file, why), std::move(hint), record};
}

std::string SystemText(std::uint32_t error) {
  return std::system_category().message(static_cast<int>(error));
}

// What the library says, which names the file, and what the system said to it.
ToolError BadImage(const KRAL_ERROR& record, std::string hint) {
  const auto reason = record.system_error == 0 ? std::string() : ": " + SystemText(record.system_error);
  return {ExitCode::kBadFile, record.text + reason, std::move(hint), record};
}

ToolError LosesData(const std::string& file, KRAL_ERROR record) {
  std::uint32_t line = 0;
  std::uint64_t bytes = 0;
  KRAL_HEX_FindLoss(file.c_str(), &line, &bytes, nullptr);
  return {ExitCode::kBadFile, Format("{}: {} would be lost in all", record.text, Counted(bytes, "byte")),
          "data need an extended address record (type 02 or 04) in front of them, the lowest of a region must come "
          "first, and no address twice with other data: kral flash hex writes such files from a binary",
          record};
}

KRAL_IMAGE_INFO ReadInfo(const std::string& file, std::uint32_t format) {
  KRAL_IMAGE_INFO info{};
  std::uint32_t result = 0;
  if (KRAL_IMAGE_GetInfo(file.c_str(), format, &info, &result) != 0) return info;
  const auto record = LastError(0).value_or(KRAL_ERROR{});
  switch (result) {
    case KRAL_STREAM_FILE_NOT_OPENED:
      throw BadImage(record, "check its name and permissions");
    case KRAL_STREAM_FILE_TOO_LARGE:
      throw BadImage(file, "the file has 4 GiB or more, or more than this program can map",
                     "addresses have 32 bits: split the image", record);
    case KRAL_STREAM_FILE_NOT_READ:
      throw BadImage(file, "the file became shorter while it was read", "wait until it is complete", record);
    case KRAL_STREAM_DATA_LOST:
      throw LosesData(file, record);
    case KRAL_STREAM_PAST_END:
      throw BadImage(file, "its image would go on past address 0xFFFFFFFF",
                     "each extended address record (type 02 or 04) must have data right behind it", record);
    default:
      break;
  }
  throw BadImage(record,
                 "a broken record, a missing end-of-file record, or data spread over more than 128 MiB; raw images are "
                 "taken with --format bin");
}

// A single digit is left to drive letters' neighbours: only numbers stand in front of the colon.
std::optional<std::uint8_t> TakeType(std::string_view& argument) {
  std::uint8_t type = 0;
  const auto [end, error] = std::from_chars(argument.data(), argument.data() + argument.size(), type);
  const auto length = static_cast<std::size_t>(end - argument.data());
  if (error != std::errc() || length >= argument.size() || argument[length] != ':') return std::nullopt;
  argument.remove_prefix(length + 1);
  return type;
}

}  // namespace

std::uint64_t CheckFile(const std::string& file, std::uint64_t most) {
  FileReader reader;
  if (const auto error = reader.Open(file)) {
    throw BadImage(file, "the file cannot be opened: " + error.message(), "check its name and permissions");
  }
  if (reader.size() == 0) throw BadImage(file, "the file is empty", "check its name");
  if (reader.size() <= most) return reader.size();
  throw BadImage(file, Format("it has {} bytes", reader.size()), Format("at most {} are taken", most));
}

std::uint32_t ParseImageFormat(std::string_view name) {
  if (name == "hex") return KRAL_IMAGE_FORMAT_HEX;
  return name == "bin" ? KRAL_IMAGE_FORMAT_BINARY : KRAL_IMAGE_FORMAT_BY_CONTENT;
}

FlashImage NameFlashImage(std::string_view argument) {
  FlashImage image;
  image.type = TakeType(argument);
  image.file = argument;
  return image;
}

FlashImage ReadFlashImage(std::string_view argument, std::uint32_t format) {
  auto image = NameFlashImage(argument);
  image.info = ReadInfo(image.file, format);
  if (image.info.size[1] != 0) {
    throw BadImage(image.file, "it has a second region at 0x08000000, which a download would leave out",
                   "split the file into one image for each region");
  }
  if (image.info.size[0] == 0) {
    throw BadImage(image.file, "it holds no data",
                   "data in front of the first extended address record (type 02 or 04) do not count");
  }
  return image;
}

FlashImage ReadProgrammer(const std::string& file) {
  FlashImage image;
  image.file = file;
  image.info = ReadInfo(file, KRAL_IMAGE_FORMAT_HEX);
  if (image.info.size[0] == 0) throw BadImage(file, "it holds no data", "a flash programmer is an Intel HEX file");
  if (image.info.size[0] > kLargestProgrammer) {
    throw BadImage(file, Format("{} are too much for a flash programmer", SizeText(image.info.size[0])),
                   "a flash programmer has at most 500 KiB");
  }
  if (image.info.start_address == kNoStart) {
    throw BadImage(file, "it has no start address", "a flash programmer ends with a record of type 03 or 05");
  }
  if (image.info.start_address != image.info.base[0]) {
    throw BadImage(file,
                   Format("it starts at 0x{:08X}, but its lowest address is 0x{:08X}", image.info.start_address,
                          image.info.base[0]),
                   "the programmer is sent from its start address on: it must be the lowest");
  }
  return image;
}

std::string DescribeImage(const FlashImage& image) {
  const auto& info = image.info;
  const bool hex = info.format == KRAL_IMAGE_FORMAT_HEX;
  auto text = Format("{}: {}\n", image.file, hex ? "Intel HEX" : "binary");
  for (std::size_t region = 0; region < KRAL_IMAGE_REGIONS; ++region) {
    if (info.size[region] == 0) continue;
    text += Format("  region {}: 0x{:08X} to 0x{:08X}, {} bytes\n", region, info.base[region],
                   info.base[region] + info.size[region] - 1, info.size[region]);
  }
  text += Format("  {} bytes are not erased flash\n", info.payload);
  if (hex && info.start_address != kNoStart) text += Format("  starts at 0x{:08X}\n", info.start_address);
  return text;
}

Json ImageObject(const FlashImage& image) {
  const auto& info = image.info;
  Json regions = Json::array();
  for (std::size_t region = 0; region < KRAL_IMAGE_REGIONS; ++region) {
    if (info.size[region] != 0) regions.push_back({{"base", info.base[region]}, {"size", info.size[region]}});
  }
  Json object{{"file", image.file},
              {"format", info.format == KRAL_IMAGE_FORMAT_HEX ? "hex" : "bin"},
              {"regions", regions},
              {"payload", info.payload}};
  if (info.start_address != kNoStart) object["start"] = info.start_address;
  if (image.type) object["type"] = *image.type;
  return object;
}

std::uint64_t CountBlocks(const FlashImage& image, std::uint32_t block_size) {
  return (std::uint64_t{image.info.size[0]} + block_size - 1) / block_size;
}

std::uint64_t TotalBytes(const std::vector<FlashImage>& images) {
  std::uint64_t bytes = 0;
  for (const auto& image : images) bytes += image.info.size[0];
  return bytes;
}

}  // namespace kral::tool
