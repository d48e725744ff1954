#pragma once

#include "base/Guarded.h"
#include "base/UniqueFd.h"
#include "platform/Bundles.h"

#include <cstdint>
#include <memory>
#include <string_view>
#include <sys/types.h>

namespace kelvo {

/// The process at the other end of a socket, as the kernel saw it when the socket was connected. Thread-safe.
class Peer {
  public:
    /// The socket option of Linux 6.5 that gives the peer itself; older headers do not name it.
    static constexpr int kProcessOption = 77;

    /// Reads the identity now. `bundles` may be none: then the peer holds no rights. Where the system does
    /// not know `processOption`, the process is looked up by its number.
    Peer(int socket, std::shared_ptr<BundleService> bundles, int processOption = kProcessOption);

    std::int32_t processIdentifier() const { return processIdentifier_; }
    uid_t user() const { return user_; }

    /// A right of the bundle that the process runs from now; nothing for a process that has ended, whose
    /// number may be somebody else's by now.
    Value entitlement(std::string_view name) const;

    /// Gives up what it holds of the process, which has no rights from now on.
    void forget() { process_.set(nullptr); }

  private:
    bool isAlive() const;

    std::int32_t processIdentifier_ = 0;
    uid_t user_ = static_cast<uid_t>(-1);
    Guarded<std::shared_ptr<const UniqueFd>> process_;
    std::shared_ptr<BundleService> bundles_;
};

}  // namespace kelvo
