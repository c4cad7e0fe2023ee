// Conversations written down beforehand, for tests of what exactly goes over the wire.
//
//   handset.Expect("2F").Reply("2F 34 12");
//   handset.Expect("27 C5 01 01 ...").Reply("27 C5 01");   // ?? stands for any byte, ... at the end for any rest
#ifndef KRAL_HANDSET_LINE_SCRIPT_H
#define KRAL_HANDSET_LINE_SCRIPT_H

#include <deque>
#include <mutex>

#include "handset/line/bytes.h"
#include "handset/line/request_table.h"

namespace kral::handset {

struct ScriptedReply {
  Bytes bytes;
  bool framed = true;
};

// Thread-safe. Requests come in the written order; once all are consumed the handset's own services answer.
class Script {
 public:
  class Step {
   public:
    Step& Reply(std::string_view hex) { return Add({FromHex(hex), true}); }
    Step& Reply(ByteView payload) { return Add({Bytes(payload.begin(), payload.end()), true}); }
    Step& ReplyUnframed(std::string_view hex) { return Add({FromHex(hex), false}); }
    Step& Refuse(Refusal refusal);  // the request as written stands behind the code
                                    // No reply at all: the handset is silent.

   private:
    friend class Script;
    Step(Script& script, size_t index) : script_(script), index_(index) {}
    Step& Add(ScriptedReply reply);

    Script& script_;
    size_t index_;
  };

  Step Expect(std::string_view hex);
  bool Consumed() const;
  // Requests that did not match, with both hex dumps, and what is still awaited; empty when all went as written.
  std::string Problems() const;

  enum class Outcome { kNoScript, kMatched, kMismatch };
  Outcome Match(ByteView request, std::vector<ScriptedReply>& replies);

 private:
  struct Entry {
    Bytes expected;
    std::vector<bool> any;  // per byte: true where every value will do
    bool any_rest = false;
    std::vector<ScriptedReply> replies;
  };

  static size_t FirstDifference(const Entry& entry, ByteView request);

  mutable std::mutex mutex_;
  std::deque<Entry> entries_;
  size_t next_ = 0;
  std::string problems_;
};

}  // namespace kral::handset

#endif
