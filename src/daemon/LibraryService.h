#pragma once

#include "daemon/MovieRecovery.h"
#include "ipc/KVLibraryProtocol.h"
#include "platform/IPC.h"

#include <memory>

namespace kelvo {

/// Tells the system shell what lies in the library, and recovers movies for it. Thread-safe.
class LibraryService : public IPCListenerDelegate, public std::enable_shared_from_this<LibraryService> {
  public:
    /// Listens at once.
    static std::shared_ptr<LibraryService> create(const Platform& platform,
                                                  MovieRecovery::InUse isInUse = nullptr);

    bool listenerShouldAcceptNewConnection(IPCListener& listener,
                                           const IPCConnectionRef& connection) override;

  private:
    class Link;
    LibraryService(const Platform& platform, MovieRecovery::InUse isInUse);

    const std::shared_ptr<PhotoLibrary> library_;
    const std::shared_ptr<MovieRecovery> recovery_;
    const std::shared_ptr<IPCListener> listener_;
};

}  // namespace kelvo
