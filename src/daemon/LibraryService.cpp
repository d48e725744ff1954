#include "daemon/LibraryService.h"

#include <cerrno>
#include <utility>

namespace kelvo {
namespace {

constexpr std::string_view kShellEntitlement = "com.quillon.private.kelvo-kit";

Dictionary described(const PhotoAssetDetails& details) {
    return {{"identifier", details.asset.localIdentifier},
            {"path", details.hostPath},
            {"creationDate", details.creationDate},
            {"size", details.size}};
}

}  // namespace

/// What one connection may ask.
class LibraryService::Link : public KVLibraryProtocol {
  public:
    Link(std::shared_ptr<PhotoLibrary> library, std::shared_ptr<MovieRecovery> recovery,
         std::weak_ptr<IPCConnection> connection)
        : library_(std::move(library)), recovery_(std::move(recovery)), connection_(std::move(connection)) {}

    void listMovies(MoviesHandler handler) override {
        if (!handler) return;
        if (const OptionalError refusal = reasonToRefuse()) return handler({}, refusal);
        const auto assets = library_->assets();
        if (!assets) return handler({}, assets.error());
        std::vector<Dictionary> movies;
        for (const PhotoAssetDetails& each : *assets)
            movies.push_back(described(each));
        handler(movies, std::nullopt);
    }

    void recoverMovies(MoviesHandler handler) override {
        OptionalError error = reasonToRefuse();
        if (!error) {
            error = recovery_->recover([handler](const std::vector<Dictionary>& movies) {
                if (handler) handler(movies, std::nullopt);
            });
        }
        if (error && handler) handler({}, error);
    }

  private:
    OptionalError reasonToRefuse() const {
        const auto connection = connection_.lock();
        if (connection && holdsEntitlement(*connection, kShellEntitlement)) return std::nullopt;
        return KVError::posix(EPERM, "the library");
    }

    const std::shared_ptr<PhotoLibrary> library_;
    const std::shared_ptr<MovieRecovery> recovery_;
    const std::weak_ptr<IPCConnection> connection_;
};

std::shared_ptr<LibraryService> LibraryService::create(const Platform& platform,
                                                       MovieRecovery::InUse isInUse) {
    std::shared_ptr<LibraryService> service(new LibraryService(platform, std::move(isInUse)));
    service->listener_->setDelegate(service);
    service->listener_->resume();
    return service;
}

LibraryService::LibraryService(const Platform& platform, MovieRecovery::InUse isInUse)
    : library_(platform.photoLibrary),
      recovery_(
          std::make_shared<MovieRecovery>(platform,
                                          std::make_shared<KVUserErrors>(std::make_shared<KVLocalization>(
                                              platform.bundles, platform.languages)),
                                          std::move(isInUse))),
      listener_(platform.ipc->createListener(kLibraryServiceName)) {}

bool LibraryService::listenerShouldAcceptNewConnection(IPCListener&, const IPCConnectionRef& connection) {
    const auto link = std::make_shared<Link>(library_, recovery_, connection);
    connection->setExported(interfaceOf<KVLibraryProtocol>(),
                            std::make_shared<ProtocolDispatcher<KVLibraryProtocol>>(link));
    // Holds the link for as long as the connection lives.
    connection->setInvalidationHandler([link] {});
    connection->resume();
    return true;
}

}  // namespace kelvo
