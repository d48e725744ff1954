#include "platform/linux/ipc/FrameLane.h"

#include <atomic>
#include <cerrno>
#include <climits>
#include <fcntl.h>
#include <linux/futex.h>
#include <new>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <type_traits>
#include <unistd.h>
#include <utility>

namespace kelvo {
namespace {

constexpr std::size_t kLine = 64;  // what processors hand each other at once

KVError systemError(const char* what) {
    return KVError::posix(errno, what);
}

/// What one end wrote is seen by the other one as soon as it sees the number that says so. A test that has
/// both ends in one process has the page twice, which the thread sanitizer takes for two memories.
void agreeWithTheOtherEnd() {
#ifdef __SANITIZE_THREAD__
    static std::atomic<int> both{0};
    both.fetch_add(1, std::memory_order_acq_rel);
#endif
}

}  // namespace

struct FrameLane::Shared {
    alignas(kLine) std::atomic<std::uint32_t> count{0};  // of the entries so far
    std::atomic<std::uint32_t> bell{0};
    /// By place: the serial of the last frame that was there and was given back.
    alignas(kLine) std::array<std::atomic<std::uint32_t>, kPlaces> givenBack{};
    alignas(kLine) std::array<Entry, kPlaces> entries{};
    static_assert(sizeof(Entry) == 2 * kLine);
};

FrameLane::Page::~Page() {
    if (shared != nullptr) ::munmap(shared, sizeof(Shared));
}

Result<FrameLane> FrameLane::create() {
    UniqueFd descriptor(::memfd_create("kelvo-frame-lane", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    if (!descriptor) return systemError("frame lane");
    if (::ftruncate(descriptor.get(), sizeof(Shared)) != 0) return systemError("size of a frame lane");
    if (::fcntl(descriptor.get(), F_ADD_SEALS, F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_SEAL) != 0)
        return systemError("seals of a frame lane");
    auto lane = map(std::move(descriptor));
    if (lane) new (lane->page_->shared) Shared();
    return lane;
}

Result<FrameLane> FrameLane::fromDescriptor(UniqueFd descriptor) {
    struct stat status {};
    if (::fstat(descriptor.get(), &status) != 0) return systemError("frame lane");
    const int seals = ::fcntl(descriptor.get(), F_GET_SEALS);
    const bool isFixed = seals >= 0 && (seals & F_SEAL_SHRINK) != 0;
    if (!isFixed || status.st_size < static_cast<off_t>(sizeof(Shared)))
        return KVError::posix(EINVAL, "no frame lane");
    return map(std::move(descriptor));
}

Result<FrameLane> FrameLane::map(UniqueFd descriptor) {
    // Two processes agree about it: no locks, no pointers, nothing to destroy.
    static_assert(std::atomic<std::uint32_t>::is_always_lock_free &&
                  std::is_trivially_destructible_v<Shared>);
    const auto page = std::make_shared<Page>(std::move(descriptor));
    void* address =
        ::mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE, MAP_SHARED, page->descriptor.get(), 0);
    if (address == MAP_FAILED) return systemError("mapping of a frame lane");
    page->shared = static_cast<Shared*>(address);
    return FrameLane(page);
}

void FrameLane::put(std::uint32_t number, const Entry& entry) {
    page_->shared->entries[number % kPlaces] = entry;
    agreeWithTheOtherEnd();
    page_->shared->count.store(number + 1, std::memory_order_release);
}

bool FrameLane::isGivenBack(std::size_t place, std::uint32_t serial) const {
    const bool isBack = page_->shared->givenBack[place].load(std::memory_order_acquire) == serial;
    agreeWithTheOtherEnd();
    return isBack;
}

bool FrameLane::hasEntry(std::uint32_t number) const {
    const bool isThere = page_->shared->count.load(std::memory_order_acquire) != number;
    agreeWithTheOtherEnd();
    return isThere;
}

FrameLane::Entry FrameLane::entry(std::uint32_t number) const {
    return page_->shared->entries[number % kPlaces];
}

void FrameLane::giveBack(std::size_t place, std::uint32_t serial) {
    agreeWithTheOtherEnd();
    page_->shared->givenBack[place].store(serial, std::memory_order_release);
}

std::uint32_t FrameLane::bell() const {
    return page_->shared->bell.load(std::memory_order_acquire);
}

void FrameLane::ring() {
    page_->shared->bell.fetch_add(1, std::memory_order_release);
    ::syscall(SYS_futex, &page_->shared->bell, FUTEX_WAKE, INT_MAX, nullptr, nullptr, 0);
}

void FrameLane::waitForBell(std::uint32_t bell) const {
    ::syscall(SYS_futex, &page_->shared->bell, FUTEX_WAIT, bell, nullptr, nullptr, 0);
}

}  // namespace kelvo
