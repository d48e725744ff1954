#pragma once

#include "base/UniqueFd.h"

#include <functional>
#include <string>
#include <sys/types.h>

namespace kelvo::test {

/// A process of its own, forked from this one, that connects to a socket and hands the connection over: for
/// the other side it is that process's. The process sleeps until this object goes.
class ForeignSocket {
  public:
    /// `beforeConnecting` learns the process's identifier while it has done nothing yet.
    ForeignSocket(const std::string& path, const std::function<void(pid_t)>& beforeConnecting);
    ~ForeignSocket() { kill(); }
    ForeignSocket(const ForeignSocket&) = delete;
    ForeignSocket& operator=(const ForeignSocket&) = delete;

    pid_t processIdentifier() const { return processIdentifier_; }
    /// The connection, once; invalid when it could not be made.
    UniqueFd take() { return std::move(socket_); }
    void kill();

  private:
    pid_t processIdentifier_ = -1;
    bool isKilled_ = false;
    UniqueFd socket_;
};

}  // namespace kelvo::test
