// A handset at the end of a caller's transport that answers the requests as its target likes.
#ifndef KRAL_FUZZ_LYING_HANDSET_H
#define KRAL_FUZZ_LYING_HANDSET_H

#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "handset/caller_transport.h"
#include "handset/virtual_handset.h"
#include "kral/connection.h"
#include "kral/transport.h"

namespace kral::fuzz {

class LyingHandset {
 public:
  LyingHandset() {
    phone_.KeepTrace(false);
    handle_ = KRAL_ConnectServer_UserDefinedTransport(
        1, transport_.handle_value(), transport_.context(), &handset::CallerTransport::Send,
        &handset::CallerTransport::Receive, &handset::CallerTransport::Flush);
    KRAL_SetReceiveMode(handle_, KRAL_RECEIVE_MODE_WAKE);
  }
  ~LyingHandset() { KRAL_DisconnectServer(handle_); }
  LyingHandset(const LyingHandset&) = delete;
  LyingHandset& operator=(const LyingHandset&) = delete;

  KRAL_HANDLE handle() const { return handle_; }
  handset::VirtualHandset& phone() { return phone_; }

  template <class State>
  State& state() {
    return Kral_ResourceManager::GetPhone(handle_)->state<State>();
  }

 private:
  handset::VirtualHandset phone_;
  handset::CallerTransport transport_{phone_};
  KRAL_HANDLE handle_ = 0;
};

}  // namespace kral::fuzz

#endif
