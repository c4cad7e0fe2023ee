// Reads the packets of a pcapng file as its readers do, sharing nothing with what writes it.
#ifndef KRAL_TESTS_SUPPORT_PCAPNG_READING_H
#define KRAL_TESTS_SUPPORT_PCAPNG_READING_H

#include <cstdint>
#include <map>
#include <string>
#include <vector>

namespace kral::test {

struct PcapngPacket {
  uint32_t interface = 0;
  uint64_t microseconds = 0;
  uint32_t flags = 0;
  std::string comment;
  std::vector<uint8_t> data;

  bool sent() const { return (flags & 3) == 2; }
};

struct PcapngReading {
  std::vector<std::pair<uint16_t, std::string>> interfaces;  // link type and name
  std::vector<PcapngPacket> packets;
  std::vector<std::pair<uint64_t, uint64_t>> statistics;  // received and dropped of each interface
  bool whole = true;                                      // it ends behind a block

  explicit PcapngReading(const std::vector<uint8_t>& file) {
    size_t at = 0;
    while (at + 12 <= file.size()) {
      const size_t length = Word(file, at + 4);
      if (length < 12 || length % 4 != 0 || at + length > file.size() || Word(file, at + length - 4) != length) break;
      Take(Word(file, at), {file.begin() + static_cast<std::ptrdiff_t>(at + 8),
                            file.begin() + static_cast<std::ptrdiff_t>(at + length - 4)});
      at += length;
    }
    whole = at == file.size();
  }

 private:
  using Bytes = std::vector<uint8_t>;

  static uint32_t Word(const Bytes& bytes, size_t at) {
    return static_cast<uint32_t>(bytes.at(at) | bytes.at(at + 1) << 8 | bytes.at(at + 2) << 16) |
           static_cast<uint32_t>(bytes.at(at + 3)) << 24;
  }
  static uint64_t Long(const Bytes& bytes, size_t at) { return Word(bytes, at) | uint64_t{Word(bytes, at + 4)} << 32; }

  static std::map<unsigned, Bytes> Options(const Bytes& body, size_t at) {
    std::map<unsigned, Bytes> options;
    while (at + 4 <= body.size() && Word(body, at) != 0) {
      const size_t size = Word(body, at) >> 16;
      const auto begin = body.begin() + static_cast<std::ptrdiff_t>(at + 4);
      options[Word(body, at) & 0xFFFF] = Bytes(begin, begin + static_cast<std::ptrdiff_t>(size));
      at += 4 + (size + 3) / 4 * 4;
    }
    return options;
  }
  static std::string Text(const Bytes& bytes) { return {bytes.begin(), bytes.end()}; }

  void Take(uint32_t type, const Bytes& body) {
    if (type == 1) {
      interfaces.emplace_back(Word(body, 0) & 0xFFFF, Text(Options(body, 8)[2]));
    } else if (type == 5) {
      auto options = Options(body, 12);
      statistics.emplace_back(Long(options[4], 0), Long(options[5], 0));
    } else if (type == 6) {
      const size_t size = Word(body, 12);
      auto options = Options(body, 20 + (size + 3) / 4 * 4);
      const auto data = body.begin() + 20;
      packets.push_back({Word(body, 0), Word(body, 8) | uint64_t{Word(body, 4)} << 32, Word(options[2], 0),
                         Text(options[1]), Bytes(data, data + static_cast<std::ptrdiff_t>(size))});
    }
  }
};

}  // namespace kral::test

#endif
