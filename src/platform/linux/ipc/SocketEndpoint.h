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

    /// Sends one end of a fresh connection to the listener. Never waits.
    OptionalError sendConnection(int connection) const;
    /// The connection in the next packet at the listener's end of an endpoint's socket; none when the packet
    /// holds anything else, whose descriptors are closed. `isAtEnd` says that no packet is there.
    static UniqueFd receiveConnection(int listener, bool& isAtEnd);

  private:
    const UniqueFd socket_;
};

}  // namespace kelvo
