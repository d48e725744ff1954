#pragma once

#include "base/Result.h"
#include "base/UniqueFd.h"
#include "platform/IPC.h"

#include <memory>

namespace kelvo {

/// One end of a packet socket whose other end an anonymous listener reads: whoever holds this end can send it
/// a fresh connection. Thread-safe.
class SocketEndpoint : public IPCEndpoint {
  public:
    explicit SocketEndpoint(UniqueFd socket) : socket_(std::move(socket)) {}

    /// Fails when the descriptor is no packet socket of this machine.
    static Result<std::shared_ptr<SocketEndpoint>> fromDescriptor(UniqueFd descriptor);

    int descriptor() const { return socket_.get(); }

  private:
    const UniqueFd socket_;
};

}  // namespace kelvo
