#include "platform/linux/ipc/SocketListener.h"

#include "base/KVLog.h"
#include "platform/IPCBounds.h"
#include "platform/linux/ipc/InheritedSocket.h"
#include "platform/linux/ipc/SocketConnection.h"

#include <array>
#include <atomic>
#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <sys/epoll.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

namespace kelvo {
namespace {

constexpr int kBacklog = 128;
/// Connections that are taken in a row, so that those who come without end do not keep the loop.
constexpr int kMostATurn = 16;

/// How many connections are open, altogether and for each process.
struct OpenConnections {
    std::size_t all = 0;
    std::map<std::int32_t, std::size_t> ofProcess;

    bool enter(std::int32_t processIdentifier) {
        if (all >= ipc_bounds::kMostConnections ||
            ofProcess[processIdentifier] >= ipc_bounds::kMostConnectionsOfOneProcess)
            return false;
        ++all;
        ++ofProcess[processIdentifier];
        return true;
    }
    void leave(std::int32_t processIdentifier) {
        --all;
        if (--ofProcess[processIdentifier] == 0) ofProcess.erase(processIdentifier);
    }
};

std::int32_t processBehind(int socket) {
    ucred credentials{};
    socklen_t size = sizeof(credentials);
    return ::getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &credentials, &size) == 0 ? credentials.pid : 0;
}

UniqueFd openNothing() {
    return UniqueFd(::open("/dev/null", O_RDONLY | O_CLOEXEC));
}

}  // namespace

/// What the loop holds; the listener may go while it accepts.
class SocketListener::Door : public SocketWatcher, public std::enable_shared_from_this<Door> {
  public:
    Door(std::shared_ptr<SocketLoop> loop, std::shared_ptr<BundleService> bundles,
         std::shared_ptr<const DeviceRoot> root, bool isNamed)
        : loop_(std::move(loop)), bundles_(std::move(bundles)), root_(std::move(root)), isNamed_(isNamed) {}

    void setListener(SocketListener* listener) {
        const std::lock_guard lock(mutex_);
        listener_ = listener;
    }
    void setSocket(UniqueFd socket) {
        const std::lock_guard lock(mutex_);
        socket_ = std::move(socket);
    }
    void setInheritedSocket(UniqueFd socket) {
        isInherited_ = true;
        setSocket(std::move(socket));
    }
    bool isInherited() const { return isInherited_; }
    bool hasSocket() {
        const std::lock_guard lock(mutex_);
        return static_cast<bool>(socket_);
    }

    void open() {
        const std::lock_guard lock(mutex_);
        if (token_ == 0) token_ = loop_->add(socket_.get(), shared_from_this());
        loop_->arm(socket_.get(), token_, EPOLLIN);
    }

    /// Nothing is accepted afterwards.
    void shut() {
        const std::lock_guard lock(mutex_);
        listener_ = nullptr;
        if (token_ != 0) loop_->remove(socket_.get(), token_);
        if (!isInherited_) ::shutdown(socket_.get(), SHUT_RDWR);
    }

    void ready(std::uint32_t) override {
        bool isAtEnd = false;
        for (int count = 0; !isAtEnd && count < kMostATurn; ++count) {
            UniqueFd next =
                isNamed_ ? acceptNext(isAtEnd) : SocketEndpoint::receiveConnection(socket_.get(), isAtEnd);
            if (next) welcome(std::move(next));
        }
        const std::lock_guard lock(mutex_);
        if (listener_ != nullptr) loop_->arm(socket_.get(), token_, EPOLLIN);
    }
    std::optional<Moment> tick(Moment) override { return std::nullopt; }

    Guarded<std::weak_ptr<IPCListenerDelegate>> delegate;

  private:
    UniqueFd acceptNext(bool& isAtEnd) {
        UniqueFd next(::accept4(socket_.get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
        isAtEnd = !next;
        if (!next && (errno == EMFILE || errno == ENFILE)) turnAwayNext();
        return next;
    }

    /// Without a descriptor left a connection stays in the socket's queue and would wake the loop for ever.
    void turnAwayNext() {
        const std::lock_guard lock(mutex_);
        spare_ = UniqueFd();
        UniqueFd refused(::accept4(socket_.get(), nullptr, nullptr, SOCK_CLOEXEC));
        KVLogError("IPC: turned away a client: no descriptors left");
        refused.reset();  // makes room for the spare one again
        spare_ = openNothing();
    }

    void welcome(UniqueFd socket) {
        const std::int32_t processIdentifier = processBehind(socket.get());
        if (!open_->with([&](OpenConnections& all) { return all.enter(processIdentifier); })) {
            KVLogError("IPC: turned away PID %d: too many connections", processIdentifier);
            return;
        }
        const auto connection = std::make_shared<SocketConnection>(
            SocketConnection::Side::server, std::move(socket), loop_, bundles_, root_,
            [all = open_, processIdentifier] {
                all->with([&](OpenConnections& each) { each.leave(processIdentifier); });
            });
        const std::lock_guard lock(mutex_);
        const auto decider = delegate.copy().lock();
        const bool isKept = listener_ != nullptr && decider &&
                            decider->listenerShouldAcceptNewConnection(*listener_, connection);
        if (!isKept) connection->invalidate();
    }

    const std::shared_ptr<SocketLoop> loop_;
    const std::shared_ptr<BundleService> bundles_;
    const std::shared_ptr<const DeviceRoot> root_;
    const bool isNamed_;
    const std::shared_ptr<Guarded<OpenConnections>> open_ = std::make_shared<Guarded<OpenConnections>>();
    std::recursive_mutex mutex_;  // a listener stays while its delegate decides, and the delegate may drop it
    SocketListener* listener_ = nullptr;
    UniqueFd socket_;                       // set before it is opened, and kept
    std::atomic<bool> isInherited_{false};  // the service manager listens on when this process is gone
    SocketLoop::Token token_ = 0;
    UniqueFd spare_ = openNothing();  // given up to accept, and end, what cannot be kept
};

SocketListener::SocketListener(std::string path, std::shared_ptr<SocketEndpoint> endpoint,
                               std::shared_ptr<Door> door)
    : path_(std::move(path)), endpoint_(std::move(endpoint)), door_(std::move(door)) {
    door_->setListener(this);
}

SocketListener::~SocketListener() {
    door_->shut();
    if (!path_.empty() && door_->hasSocket() && !door_->isInherited()) ::unlink(path_.c_str());
}

std::shared_ptr<SocketListener> SocketListener::named(std::string path, std::shared_ptr<SocketLoop> loop,
                                                      std::shared_ptr<BundleService> bundles,
                                                      std::shared_ptr<const DeviceRoot> root) {
    auto door = std::make_shared<Door>(std::move(loop), std::move(bundles), std::move(root), true);
    return std::shared_ptr<SocketListener>(new SocketListener(std::move(path), nullptr, std::move(door)));
}

Result<std::shared_ptr<IPCListener>> SocketListener::anonymous(std::shared_ptr<SocketLoop> loop,
                                                               std::shared_ptr<BundleService> bundles,
                                                               std::shared_ptr<const DeviceRoot> root) {
    std::array<int, 2> ends{-1, -1};
    if (::socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends.data()) != 0)
        return KVError::posix(errno, "anonymous listener");
    auto door = std::make_shared<Door>(std::move(loop), std::move(bundles), std::move(root), false);
    door->setSocket(UniqueFd(ends[0]));
    auto endpoint = std::make_shared<SocketEndpoint>(UniqueFd(ends[1]));
    return std::shared_ptr<IPCListener>(new SocketListener("", std::move(endpoint), std::move(door)));
}

void SocketListener::setDelegate(std::weak_ptr<IPCListenerDelegate> delegate) {
    door_->delegate.set(std::move(delegate));
}

void SocketListener::resume() {
    if (door_->hasSocket()) return door_->open();
    if (UniqueFd inherited = inheritedSocket(path_.substr(path_.rfind('/') + 1))) {
        door_->setInheritedSocket(std::move(inherited));
        return door_->open();
    }
    std::error_code ignored;  // a folder that cannot be made shows in the bind
    std::filesystem::create_directories(std::filesystem::path(path_).parent_path(), ignored);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    UniqueFd socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (path_.size() >= sizeof(address.sun_path)) errno = ENAMETOOLONG;
    const bool isListening = path_.size() < sizeof(address.sun_path) && socket && [&] {
        path_.copy(address.sun_path, sizeof(address.sun_path) - 1);
        ::unlink(path_.c_str());  // the instance lock says that nobody listens there any more
        return ::bind(socket.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)) == 0 &&
               ::listen(socket.get(), kBacklog) == 0;
    }();
    if (!isListening) {
        KVLogError("IPC: cannot listen: %s", KVError::posix(errno, path_).localizedDescription().c_str());
        return;
    }
    door_->setSocket(std::move(socket));
    door_->open();
}

}  // namespace kelvo
