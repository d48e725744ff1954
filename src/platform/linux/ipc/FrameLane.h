#pragma once

#include "base/Result.h"
#include "base/UniqueFd.h"
#include "base/VideoSurface.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>

namespace kelvo {

/// A page of memory that a daemon and a client share, by which frames go one way and come back the other.
///
/// A message through a socket costs a dozen cold paths of the kernel for each frame, most of all its
/// descriptor. A client that has the surface already needs none of that: it is told here which one it is, and
/// woken by a futex. Neither side trusts the other: the daemon reads nothing back but whether a frame was
/// given back, and the page can neither grow nor shrink. Copies share the page; thread-safe as said.
class FrameLane {
  public:
    /// As many frames as may be lent to one client.
    static constexpr std::size_t kPlaces = 16;
    /// Bytes that go with a frame: a timing record is 72.
    static constexpr std::size_t kMostBytes = 96;

    /// What is told of one frame. Laid out alike on processors of 32 and of 64 bits.
    struct alignas(8) Entry {
        std::uint32_t serial = 0;  ///< among the messages of the connection, which are in one order with it
        std::uint32_t method = 0;  ///< its place in the client's interface
        VideoSurface::File surface{};
        std::uint32_t size = 0;  ///< of `bytes`
        std::array<std::byte, kMostBytes> bytes{};
    };

    /// A new lane, for the daemon. Fails when memory or descriptors run out.
    static Result<FrameLane> create();
    /// The client's end of one. Fails when it is too small, or could still shrink.
    static Result<FrameLane> fromDescriptor(UniqueFd descriptor);

    /// What the client maps.
    int descriptor() const { return page_->descriptor.get(); }

    // The daemon's side, one thread at a time.
    /// Puts an entry at `number % kPlaces`. Whatever was there was given back.
    void put(std::uint32_t number, const Entry& entry);
    bool isGivenBack(std::size_t place, std::uint32_t serial) const;

    // The client's side.
    /// Whether there is an entry with this number yet, counted from 0. Any thread.
    bool hasEntry(std::uint32_t number) const;
    /// One that is there and was not given back.
    Entry entry(std::uint32_t number) const;
    /// Any thread.
    void giveBack(std::size_t place, std::uint32_t serial);
    /// Waits until the bell was rung after it stood at `bell`, or for no reason.
    void waitForBell(std::uint32_t bell) const;
    std::uint32_t bell() const;

    /// Wakes who waits. Any thread of either side; never waits.
    void ring();

  private:
    struct Shared;
    struct Page {
        UniqueFd descriptor;
        Shared* shared = nullptr;

        explicit Page(UniqueFd file) : descriptor(std::move(file)) {}
        ~Page();
        Page(const Page&) = delete;
        Page& operator=(const Page&) = delete;
    };
    explicit FrameLane(std::shared_ptr<Page> page) : page_(std::move(page)) {}
    static Result<FrameLane> map(UniqueFd descriptor);

    std::shared_ptr<Page> page_;
};

}  // namespace kelvo
