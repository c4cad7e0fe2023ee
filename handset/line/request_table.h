// The requests that the handset knows, by command code and by subsystem, and what it refuses without asking them.
#ifndef KRAL_HANDSET_LINE_REQUEST_TABLE_H
#define KRAL_HANDSET_LINE_REQUEST_TABLE_H

#include <functional>
#include <unordered_map>

#include "handset/line/bytes.h"
#include "handset/line/wire.h"

namespace kral::handset {

// Replies that refuse a request; the request as it came stands behind the code.
enum class Refusal : uint8_t { kBadCommand = 19, kBadParameter = 20, kBadLength = 21, kBadMode = 24 };

inline constexpr uint8_t kSubsystemDispatch = 75;

// Total bytes of a request, command code included.
struct Length {
  size_t least = 0;
  size_t most = SIZE_MAX;

  static constexpr Length Exactly(size_t size) { return {size, size}; }
  static constexpr Length AtLeast(size_t size) { return {size, SIZE_MAX}; }
  static constexpr Length Between(size_t least, size_t most) { return {least, most}; }
};

// Answers a request of a checked length by any number of wire.Send; none is silence.
using Handler = std::function<void(ByteView request, Wire& wire)>;

void Refuse(Refusal refusal, ByteView request, Wire& wire);

class RequestTable {
 public:
  // A later registration replaces an earlier one.
  void On(uint8_t code, Length length, Handler handler);
  void OnSubsystem(uint8_t subsystem, uint16_t command, Length length, Handler handler);
  // Everything of a subsystem that has no handler of its own: for families that sort further themselves.
  void OnSubsystem(uint8_t subsystem, Length length, Handler handler);

  void Answer(ByteView request, Wire& wire) const;

 private:
  struct Entry {
    Length length;
    Handler handler;
  };

  const Entry* Find(ByteView request) const;

  std::unordered_map<uint32_t, Entry> entries_;
};

// A group of requests with the state behind them. Its accessors may be called from any thread.
class Service {
 public:
  virtual ~Service() = default;
  virtual void Register(RequestTable& table) = 0;
  virtual void OnReset() {}  // the handset restarts; what is not kept in its memory is gone
};

}  // namespace kral::handset

#endif
