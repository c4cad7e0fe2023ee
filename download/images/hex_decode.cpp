// Intel HEX into an image. The first pass finds the base address, the second loads the data.
#include <algorithm>
#include <array>
#include <iterator>
#include <limits>
#include <span>
#include <string_view>

#include "download/images/hex_format.h"
#include "download/images/hex_phone_image_decoder.h"

namespace kral::images {
namespace {

using LineText = std::string_view;
using namespace std::string_view_literals;

constexpr uint32_t kUnknown = std::numeric_limits<uint32_t>::max();

uint16_t DigitAt(LineText line, size_t at) {
  return at < line.size() ? hex::kDigitValues[static_cast<uint8_t>(line[at])] : 0;
}

// Digits beyond 15 run over into the next ones: the sum is taken modulo the width of T. Past the line are zeros.
template <class T>
T ValueAt(LineText line, size_t at, size_t digits) {
  T value = 0;
  for (size_t i = 0; i < digits; ++i) value = static_cast<T>(value * 16u + DigitAt(line, at + i));
  return value;
}

char TypeAt(LineText line, size_t at) {
  return at < line.size() ? line[at] : '\0';
}

uint32_t SegmentBase(LineText line) {
  return uint32_t{ValueAt<uint16_t>(line, hex::kDataAt, 4)} * 16;
}

uint32_t LinearBase(LineText line) {
  return uint32_t{ValueAt<uint16_t>(line, hex::kDataAt, 4)} * 65536;
}

using RecordBytes = std::array<uint8_t, hex::kMostCharacters / 2>;

// The bytes of a record from its length field to its checksum; none when the line does not hold them whole or their
// sum is not 0.
std::span<const uint8_t> CheckedBytes(const LineReader::Line& line, size_t data_length, RecordBytes& bytes) {
  const size_t count = data_length + hex::kFrameBytes;
  if (!line.whole || line.text.size() < 1 + 2 * count) return {};
  uint8_t sum = 0;
  const char* digits = line.text.data() + 1;
  for (size_t i = 0; i < count; ++i, digits += 2) {
    const unsigned high = hex::kDigitValues[static_cast<uint8_t>(digits[0])];
    const unsigned low = hex::kDigitValues[static_cast<uint8_t>(digits[1])];
    bytes[i] = static_cast<uint8_t>(high * 16 + low);
    sum = static_cast<uint8_t>(sum + bytes[i]);
  }
  if (sum != 0) return {};
  return std::span(bytes).first(count);
}

// A record that a missing line end has hung on to this one is not read.
uint64_t BytesBehindChecksum(LineText text) {
  const size_t end = 1 + 2 * (ValueAt<uint16_t>(text, hex::kLengthAt, 2) + hex::kFrameBytes);
  if (end >= text.size()) return 0;
  const auto rest = text.substr(end);
  return rest.find_first_not_of(" \t\r\n\v\f\0"sv) == rest.npos ? 0 : (rest.size() + 1) / 2;
}

bool IsChecked(const LineReader::Line& line, size_t data_length) {
  RecordBytes bytes;
  return !CheckedBytes(line, data_length, bytes).empty();
}

}  // namespace

bool HexPhoneImageDecoder::Decode(PhoneImage& image, TextSource& file) try {
  fault_ = {};
  LineReader lines(file, hex::kMostCharacters);
  FindBase(image, lines);
  return LoadData(image, lines);
} catch (const PhoneImageException&) {
  fault_.what = "holds data that lie outside of the image, or for which there is no memory";
  return false;
}

// The base becomes the lowest extended address with a record of type x0 right behind it. Nothing is checked here, and
// the 16-bit offset of the data plays no part.
void HexPhoneImageDecoder::FindBase(PhoneImage& image, LineReader& lines) {
  image.SetStartAddress(kUnknown);
  image.SetSize(0, 0);
  start_address_present_ = false;
  linear_addressing_ = false;
  lines.Rewind();
  image.SetBaseAddress(kUnknown, 0);

  LineReader::Line line;
  uint32_t extended_base = kUnknown;  // of the line before; the unknown one is never the lower
  while (lines.Next(line)) {
    const char type = TypeAt(line.text, hex::kSecondTypeAt);
    if (type == '0' && extended_base < image.GetBaseAddress(0)) image.SetBaseAddress(extended_base, 0);
    extended_base = kUnknown;
    if (type == '2') extended_base = SegmentBase(line.text);
    if (type == '4') extended_base = LinearBase(line.text);
  }
}

bool HexPhoneImageDecoder::LoadData(PhoneImage& image, LineReader& lines) {
  lines.Rewind();
  image.SetBaseAddress(hex::kSecondRegionBase, 1);
  image.SetSize(0, 1);

  loss_ = {};
  beyond_.clear();
  for (auto& ranges : written_) ranges.clear();
  Cursor cursor{kUnknown, 0, false};
  LineReader::Line line;
  while (lines.Next(line)) {
    fault_.line = line.number;
    fault_.what = "holds no sound Intel HEX record";
    if (!LoadRecord(image, line, cursor)) return false;
  }
  LoseBeyond(image);
  fault_.what = "is the last one, but holds no end-of-file record";
  return cursor.at_end;
}

bool HexPhoneImageDecoder::LoadRecord(PhoneImage& image, const LineReader::Line& line, Cursor& cursor) {
  const LineText text = line.text;
  if (TypeAt(text, hex::kFirstTypeAt) != '0') return false;
  const char type = TypeAt(text, hex::kSecondTypeAt);
  Lose(BytesBehindChecksum(text), line.number);
  cursor.at_end = type == '1';  // records behind the end-of-file record still count
  switch (type) {
    case '0':
      return LoadBytes(image, line, cursor);
    case '1':
      return true;
    case '2':
      cursor.extended_base = SegmentBase(text);
      return IsChecked(line, 2);
    case '3':
    case '5':
      if (!IsChecked(line, 4)) return false;
      image.SetStartAddress(ValueAt<uint32_t>(text, hex::kDataAt, 8));
      start_address_present_ = true;
      start_is_linear_ = type == '5';
      linear_addressing_ = linear_addressing_ || start_is_linear_;
      return true;
    case '4':
      if (!IsChecked(line, 2)) return false;
      cursor.extended_base = LinearBase(text);
      linear_addressing_ = true;
      // From here on to the end of the file: there is no way back to region 0.
      if (cursor.extended_base == hex::kSecondRegionBase && image.GetSize(0) != 0) cursor.region = 1;
      return true;
    default:
      return false;
  }
}

bool HexPhoneImageDecoder::LoadBytes(PhoneImage& image, const LineReader::Line& line, const Cursor& cursor) {
  const auto length = ValueAt<uint16_t>(line.text, hex::kLengthAt, 2);
  // Data before the first extended address record is dropped, unchecked, on purpose.
  if (cursor.extended_base == kUnknown) {
    Lose(length, line.number);
    return true;
  }
  RecordBytes bytes;
  const std::span<const uint8_t> record = CheckedBytes(line, length, bytes);
  if (record.empty()) return false;
  const uint32_t address = cursor.extended_base + ValueAt<uint16_t>(line.text, hex::kOffsetAt, 4);
  Lose(CountReplaced(image, cursor.region, address, record.subspan(hex::kHeaderBytes, length)), line.number, true);
  image.Write(address, record.data() + hex::kHeaderBytes, length, cursor.region);
  // The first record of a region sets its size without its distance from the base, and sizes are compared modulo 2^32.
  const uint64_t end = uint64_t{address - image.GetBaseAddress(cursor.region)} + length;
  if (end > image.GetSize(cursor.region)) beyond_.push_back({end, length, cursor.region, line.number});
  return true;
}

// Bytes that an earlier record had written otherwise; notes that these are written now.
uint64_t HexPhoneImageDecoder::CountReplaced(const PhoneImage& image, uint32_t region, uint32_t address,
                                             std::span<const uint8_t> data) {
  if (data.empty()) return 0;
  const uint64_t begin = address - image.GetBaseAddress(region);
  const uint64_t end = begin + data.size();
  auto& ranges = written_[region];
  auto range = ranges.upper_bound(begin);
  if (range != ranges.begin() && std::prev(range)->second >= begin) {
    --range;
  } else {
    range = ranges.emplace_hint(range, begin, begin);
  }
  uint64_t replaced = 0;
  for (auto next = range; next != ranges.end() && next->first <= end;) {
    const uint64_t first = std::max(begin, next->first);
    const uint64_t last = std::min(end, next->second);
    if (first < last) {
      RecordBytes earlier;
      image.Read(static_cast<uint32_t>(address + (first - begin)), earlier.data(), static_cast<uint32_t>(last - first),
                 region);
      const auto now = data.subspan(static_cast<size_t>(first - begin), static_cast<size_t>(last - first));
      for (size_t i = 0; i < now.size(); ++i) {
        if (earlier[i] != now[i]) ++replaced;
      }
    }
    range->second = std::max({range->second, next->second, end});
    next = next == range ? std::next(next) : ranges.erase(next);
  }
  return replaced;
}

void HexPhoneImageDecoder::Lose(uint64_t bytes, uint64_t line, bool replaces) {
  if (bytes == 0) return;
  if (loss_.bytes == 0 || line < loss_.line) {
    loss_.line = line;
    loss_.replaces = replaces;
  }
  loss_.bytes += bytes;
}

void HexPhoneImageDecoder::LoseBeyond(PhoneImage& image) {
  for (const Beyond& record : beyond_) {
    const uint64_t size = image.GetSize(record.region);
    if (record.end > size) Lose(std::min<uint64_t>(record.length, record.end - size), record.line);
  }
}

}  // namespace kral::images
