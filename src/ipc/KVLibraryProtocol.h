#pragma once

#include "ipc/ProtocolTable.h"

#include <functional>
#include <string>
#include <vector>

namespace kelvo {

/// The socket of the library's service beside the daemon's.
inline constexpr std::string_view kLibraryServiceName = "com.quillon.kelvod.library";

/// What the shell asks about saved movies. Clients without the right "com.quillon.private.kelvo-kit" are
/// refused (EPERM).
class KVLibraryProtocol {
  public:
    virtual ~KVLibraryProtocol() = default;
    using MoviesHandler =
        std::function<void(const std::vector<Dictionary>& movies, const OptionalError& error)>;

    /// The library's movies, oldest first: "identifier", "path" (on this machine), "creationDate", "size".
    virtual void listMovies(MoviesHandler handler) = 0;

    /// Saves the movies that lie in the daemon's store with nobody to save them to the library, and cleans
    /// them from the store; one call at a time (EBUSY). Each movie is told by its
    /// "name" in the store, and with "identifier" and "path" where it is saved now, or with "error" why it is
    /// not. One that could not be saved stays in the store; one in which there is nothing to play goes.
    virtual void recoverMovies(MoviesHandler handler) = 0;
};

template <>
struct ProtocolTable<KVLibraryProtocol> {
    using P = KVLibraryProtocol;
    static constexpr std::string_view kName = "com.quillon.KelvoKit.KVLibraryProtocol";
    static constexpr std::tuple kMessages{
        Message<&P::listMovies>{
            {"listMovies", "What the library holds. Needs the right com.quillon.private.kelvo-kit."},
            {},
            {Named{"movies", "oldest first; each with identifier, path, creationDate and size"},
             Named{"error", "why it cannot be told"}}},
        Message<&P::recoverMovies>{
            {"recoverMovies",
             "Save what was left unsaved in the store. Needs the right com.quillon.private.kelvo-kit."},
            {},
            {Named{"movies", "each with its name in the store, and with identifier and path, or error"},
             Named{"error", "why nothing was tried"}}},
    };
};

/// The service as its clients see it. Thread-safe.
class RemoteLibrary : public KVLibraryProtocol {
  public:
    using P = KVLibraryProtocol;
    RemoteLibrary(IPCConnection& connection, std::function<void(const KVError&)> errorHandler)
        : sender_(connection, std::move(errorHandler)) {}

    void listMovies(MoviesHandler handler) override { sender_.send<&P::listMovies>(handler); }
    void recoverMovies(MoviesHandler handler) override { sender_.send<&P::recoverMovies>(handler); }

  private:
    const RemoteSender sender_;
};

}  // namespace kelvo
