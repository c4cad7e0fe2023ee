// Finds a time in a capture file without reading what is in front of it: in ten gigabytes as soon as in ten kilobytes.
#ifndef KRAL_TRANSPORT_COLLECTION_CAPTURE_SEEK_H
#define KRAL_TRANSPORT_COLLECTION_CAPTURE_SEEK_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <span>
#include <string>

#include "transport/collection/capture_reader.h"

namespace kral {

// Fills the buffer from that place on as far as there are bytes, and gives their number; nothing where the file cannot
// be read.
using CaptureBytes = std::function<std::optional<size_t>(uint64_t offset, std::span<uint8_t> buffer)>;

// Where the first record stands whose time is not before this one: between `begin`, where a record begins, and the end.
// Where times step back, it is a place in front of which all is earlier than this time and the greatest step.
uint64_t FindCaptureTime(const CaptureBytes& bytes, uint64_t begin, uint64_t end, uint64_t microseconds);

// The same for a file of blocks: the last of those that begin before this time, which may hold the record.
uint64_t FindCaptureBlock(const CaptureBytes& bytes, uint64_t begin, uint64_t end, uint64_t microseconds);

// As OpenCaptureSource: the head of the file, and behind it all records from that time on, with some from before it. A
// file that does not tell how its times go is given whole: then it was not sought in.
CaptureSource OpenCaptureSourceAt(const std::string& path, uint64_t microseconds, bool* is_sought = nullptr);

}  // namespace kral

#endif
