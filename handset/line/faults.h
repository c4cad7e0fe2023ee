// How a handset misbehaves on demand, repeatable from a seed.
//
//   handset.faults().Add(Split(3), When::Nth(2));              // the second reply in pieces of 3 bytes
//   handset.faults().Add(Lose(), When::Every(10).Of("4B 13"));  // every tenth reply of subsystem 19
//   handset.faults().Add(Refuse(Refusal::kBadMode), When::Always().Of("29"));
//   handset.faults().SetBitErrorRate(1e-5);
#ifndef KRAL_HANDSET_LINE_FAULTS_H
#define KRAL_HANDSET_LINE_FAULTS_H

#include <mutex>
#include <optional>
#include <random>

#include "handset/line/output_line.h"
#include "handset/line/request_table.h"

namespace kral::handset {

// Which requests a fault strikes; all replies to a struck request are. Counted from 1, among the requests that begin
// with the prefix and are longer than said, from the moment the fault is added. In a wire mode every packet sent counts
// as one.
class When {
 public:
  static When Nth(uint64_t n) { return When(n, 0); }
  static When From(uint64_t n) { return When(n, 1); }
  static When Every(uint64_t n) { return When(n, n); }
  static When Always() { return When(1, 1); }
  static When Chance(double probability);

  When Of(std::string_view prefix_hex) const;
  When LongerThan(size_t bytes) const;

 private:
  friend class FaultPlan;
  When(uint64_t first, uint64_t step) : first_(first), step_(step) {}
  bool Counts(ByteView packet) const;

  Bytes prefix_;
  size_t longer_than_ = 0;
  uint64_t first_;
  uint64_t step_;  // 0: only the first
  double probability_ = 1;
};

struct Fault {
  enum class Kind {
    kSplit,
    kMerge,
    kDelay,
    kLag,
    kAfterNextRequest,
    kLose,
    kCorrupt,
    kDuplicate,
    kRepeat,
    kWrongCode,
    kLeadingNoise,
    kRefuse,
    kIgnore,
    kHangUp,
  };
  Kind kind;
  uint32_t value = 0;
  uint32_t gap_ms = 0;
};

// --- Delivery ---
Fault Split(uint32_t piece, uint32_t gap_ms = 0);  // read in pieces
Fault Merge();                                     // held back, and read together with the next reply
Fault Delay(uint32_t milliseconds);
// The handset works on the request so long before it answers, and on what has come meanwhile only afterwards: answers
// stay in order, and one late answer holds all behind it up.
Fault Lag(uint32_t milliseconds);
Fault AfterNextRequest();  // comes too late: when the next request has arrived
Fault Lose();              // the request was carried out, its reply is gone
Fault Duplicate();
Fault Repeat();  // a second time when the next request has arrived, in front of the reply to that
// --- Content ---
Fault Corrupt();                     // a wrong frame check; of unframed bytes, the last one inverted
Fault WrongCode(uint8_t code);       // another first byte
Fault LeadingNoise(uint32_t count);  // bytes of no meaning and a flag in front
// --- The request is not carried out ---
Fault Refuse(Refusal refusal);
Fault Refuse(uint8_t code);
Fault Ignore();  // silence
Fault HangUp();  // the device vanishes

// The faults that strike one request, put together.
struct Strike {
  std::vector<Fault> faults;

  bool Has(Fault::Kind kind) const { return Find(kind) != nullptr; }
  const Fault* Find(Fault::Kind kind) const;
};

// Thread-safe.
class FaultPlan {
 public:
  void Add(Fault fault, When when);
  void SetBitErrorRate(double per_bit);
  void SetSeed(uint64_t seed);
  void Clear();
  uint64_t struck() const;  // faults that came to pass, bit errors not counted

  // For the handset: once per request, then once per reply.
  Strike Select(ByteView packet);
  std::vector<Outgoing> Deliver(const Strike& strike, ByteView packet, bool framed, uint32_t delay_ms);
  void AddBitErrors(Bytes& wire);

 private:
  struct Rule {
    Fault fault;
    When when;
    uint64_t seen = 0;
  };

  double Draw();  // 0 <= x < 1, the same on every platform
  Bytes Noise(uint32_t count);

  mutable std::mutex mutex_;
  std::vector<Rule> rules_;
  std::mt19937_64 random_{1};
  double bit_error_rate_ = 0;
  uint64_t struck_ = 0;
};

}  // namespace kral::handset

#endif
