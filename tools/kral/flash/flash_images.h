// Image files for the flash verbs: looked at before anything is sent, and the plan of writing them.
#ifndef KRAL_TOOLS_FLASH_FLASH_IMAGES_H
#define KRAL_TOOLS_FLASH_FLASH_IMAGES_H

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "kral/kral.h"
#include "tools/kral/output.h"

namespace kral::tool {

struct FlashImage {
  std::string file;
  std::optional<std::uint8_t> type;  // given in front of the file's name
  KRAL_IMAGE_INFO info{};
};

// "hex", "bin" or "auto".
std::uint32_t ParseImageFormat(std::string_view name);

// "FILE" or "TYPE:FILE", which is not looked at.
FlashImage NameFlashImage(std::string_view argument);
// The same, opened and read from end to end; ToolError kBadFile when it cannot be downloaded.
FlashImage ReadFlashImage(std::string_view argument, std::uint32_t format);
// A flash programmer: HEX, not too large, and started at its lowest address.
FlashImage ReadProgrammer(const std::string& file);

// How long it is. ToolError kBadFile for one that is no readable file, empty, or longer than `most` bytes.
std::uint64_t CheckFile(const std::string& file, std::uint64_t most = UINT64_MAX);

// What a file holds, for people and in JSON.
std::string DescribeImage(const FlashImage& image);
Json ImageObject(const FlashImage& image);

// Writes of at most `block_size` bytes. Bytes that have to be escaped may make it some more.
std::uint64_t CountBlocks(const FlashImage& image, std::uint32_t block_size);
std::uint64_t TotalBytes(const std::vector<FlashImage>& images);

}  // namespace kral::tool

#endif
