#include "platform/linux/ipc/Peer.h"

#include <cerrno>
#include <poll.h>
#include <sys/socket.h>
#include <sys/syscall.h>

namespace kelvo {
namespace {

UniqueFd openProcess(int socket, std::int32_t processIdentifier, int option) {
    int descriptor = -1;
    socklen_t size = sizeof(descriptor);
    if (::getsockopt(socket, SOL_SOCKET, option, &descriptor, &size) == 0) return UniqueFd(descriptor);
    // A process that has ended already has no descriptor either, and its number may be somebody else's.
    if (errno != ENOPROTOOPT) return {};
    return UniqueFd(static_cast<int>(::syscall(SYS_pidfd_open, processIdentifier, 0)));
}

}  // namespace

Peer::Peer(int socket, std::shared_ptr<BundleService> bundles, int processOption)
    : bundles_(std::move(bundles)) {
    ucred credentials{};
    socklen_t size = sizeof(credentials);
    if (::getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &credentials, &size) != 0) return;
    processIdentifier_ = credentials.pid;
    user_ = credentials.uid;
    process_.set(std::make_shared<const UniqueFd>(openProcess(socket, processIdentifier_, processOption)));
}

/// A process that has ended makes its descriptor readable.
bool Peer::isAlive() const {
    const auto held = process_.copy();
    if (!held || !*held) return false;
    pollfd process{held->get(), POLLIN, 0};
    return ::poll(&process, 1, 0) == 0;
}

Value Peer::entitlement(std::string_view name) const {
    if (!bundles_) return {};
    const auto executable = bundles_->executablePath(processIdentifier_);
    const auto folder = executable ? bundles_->folderOfBundleOwning(*executable) : std::nullopt;
    const BundleRef bundle = folder ? bundles_->bundleAtPath(*folder) : nullptr;
    // Asked after the look: had the number been given to another process before, ours had ended.
    if (!bundle || !isAlive()) return {};
    const Dictionary entitlements = bundle->entitlements();
    const Value* value = entitlements.find(name);
    return value != nullptr ? *value : Value();
}

}  // namespace kelvo
