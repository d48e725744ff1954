#pragma once

#include "platform/ConnectionBase.h"
#include "platform/linux/files/DeviceRoot.h"
#include "platform/linux/ipc/Authentication.h"
#include "platform/linux/ipc/DBusMessage.h"
#include "platform/linux/ipc/FrameLaneReceiver.h"
#include "platform/linux/ipc/FrameLaneSender.h"
#include "platform/linux/ipc/Peer.h"
#include "platform/linux/ipc/SocketLoop.h"
#include "platform/linux/ipc/SurfaceLending.h"

#include <deque>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

namespace kelvo {

/// A connection that speaks D-Bus over a stream socket, directly with its peer. Thread-safe.
class SocketConnection : public ConnectionBase, public SocketWatcher {
  public:
    enum class Side { server, client };

    /// `release` runs once, when the connection has ended.
    SocketConnection(Side side, UniqueFd socket, std::shared_ptr<SocketLoop> loop,
                     std::shared_ptr<BundleService> bundles, std::shared_ptr<const DeviceRoot> root,
                     Task release);
    ~SocketConnection() override;

    std::int32_t processIdentifier() const override { return peer_.processIdentifier(); }
    Value valueForEntitlement(std::string_view name) const override { return peer_.entitlement(name); }

    URL urlForPeer(const URL& url) const override;
    URL urlFromPeer(const URL& url) const override;

    bool handOver(const IPCFrame& frame) override;

    void ready(std::uint32_t events) override;
    std::optional<Moment> tick(Moment now) override;

  protected:
    OptionalError transmit(const IPCInterface& interface, std::size_t method, const Array& arguments,
                           ReplyIdentifier identifier, const ErrorReport& whenUnsent) override;
    void didResume() override;
    void didServe() override;
    bool runSoon(Task& task) override;
    void close() override;
    void didEnd() override { peer_.forget(); }

  private:
    using SentDescriptors = std::vector<dbus::SentDescriptor>;
    /// A message on its way out: what is left of its bytes, and its descriptors until the first byte is gone.
    struct Outgoing {
        Bytes bytes;
        std::size_t sent = 0;
        SentDescriptors descriptors;
        ErrorReport whenUnsent;
    };
    /// What sending threads share, under `outMutex_`.
    struct Out {
        std::deque<Outgoing> queue;
        std::size_t unsentBytes = 0;
        std::size_t unsentDescriptors = 0;
        std::uint32_t lastSerial = 0;
        std::map<std::uint32_t, std::pair<ReplyIdentifier, std::size_t>>
            awaited;  // by serial; and the method
        std::map<std::uint32_t, LentSurfaces>
            lent;                // by the serial of the message that the peer has yet to let go
        SurfaceReturns returns;  // what this side has let go of
        std::unique_ptr<FrameLaneSender> lane;  // a server's
        std::uint32_t laneRequest = 0;          // a client's: the serial of its request for one
    };
    enum class Flushed { all, some };
    using Socket = std::shared_ptr<UniqueFd>;

    Socket socket() const { return socket_.copy(); }
    bool isPaused() const;
    /// A server says nothing before the conversation's end; a client's greeting is the first thing it sends.
    bool maySend() const { return side_ == Side::client || isAuthenticated_; }
    void arm();
    void receive(int socket);
    enum class Received { nothing, some, all };
    Received receiveSome(int socket);
    void noteDeadline();
    void handleReceived();
    bool authenticate();
    bool handleNextMessage();
    void handle(dbus::Message& message);
    void handleCall(dbus::Message& message);
    void handleExportedCall(dbus::Message& message, std::size_t method, const IPCInterface& interface);
    void handleStandardCall(const dbus::Message& message);
    void handleReply(dbus::Message& message);
    Result<Array> readArguments(dbus::Message& message, const IPCMethod& description,
                                const std::shared_ptr<void>& lease);
    Result<VideoSurfaceRef> openSurface(UniqueFd descriptor, const VideoSurface::Geometry& geometry);
    std::shared_ptr<void> answerAtTheEnd(std::uint32_t serial);
    void holdSurfaces();
    void letGo(std::uint32_t serial, std::optional<std::size_t> place = {});
    // The lane, on a server's side.
    void answerWithLane(const dbus::Message& call);
    std::optional<Moment> takeGivenBackWhenLent(Moment now);
    bool mayLend(LentSurfaces& givenBack);
    void lend(std::uint32_t serial, LentSurfaces&& surfaces);
    // On a client's.
    void askForLane();
    void openLane(dbus::Message& reply);
    /// A frame on its way to whoever serves it.
    struct LaneFrame {
        FrameLane::Entry entry;
        VideoSurfaceRef surface;

        IPCFrame call() const { return {entry.method, surface, std::span(entry.bytes).first(entry.size)}; }
    };
    class FrameLoan;
    void laneRang();
    bool serveNextOfLane();
    bool handleNextOfLane();
    std::optional<LaneFrame> takeFrame();
    VideoSurfaceRef surfaceOf(const FrameLane::Entry& entry, std::size_t place);
    void sendReturns(std::unique_lock<std::mutex> outLock);
    std::optional<Moment> returnSurfacesWhenDue(Moment now);
    IPCReply replyTo(std::uint32_t serial, const IPCMethod& method);
    void answer(const dbus::Message& call, const std::string& signature, const Array& values);
    void answerError(const dbus::Message& call, const char* name, const std::string& text);
    // A message that is sent gets its serial and gives its descriptors away.
    void sendMessage(dbus::Message& message);
    OptionalError sendCall(dbus::Message& message, ReplyIdentifier identifier, std::size_t method,
                           LentSurfaces surfaces, ErrorReport whenUnsent);
    // All under `outMutex_`.
    std::uint32_t nextSerial();
    bool push(dbus::Message& message, ErrorReport whenUnsent = nullptr);
    bool push(Outgoing&& outgoing);
    bool pushReturns();
    static std::vector<ErrorReport> reportsOf(std::deque<Outgoing> unsent);
    void dropUnsent(SentDescriptors& gone);
    // Without it.
    void afterPush(bool isWithinBounds);
    Flushed flush(int socket);
    Flushed flushUnderLock(int socket, SentDescriptors& gone);

    const Side side_;
    Guarded<Socket> socket_;
    const std::shared_ptr<SocketLoop> loop_;
    Peer peer_;
    const std::shared_ptr<const DeviceRoot> root_;
    Guarded<Task> release_;
    std::atomic<SocketLoop::Token> token_{0};

    // Under `receiveMutex_`: it is one of the loop's threads at a time, but not always the same.
    std::mutex receiveMutex_;
    Bytes incoming_;
    std::size_t messagesThisTurn_ = 0;
    std::vector<UniqueFd> receivedDescriptors_;
    std::optional<dbus::ServerAuthentication> authentication_;
    std::optional<Moment> deadline_;
    SurfaceCache surfaces_;
    std::uint32_t lastReceived_ = 0;  // serial
    bool hasAskedForLane_ = false;
    std::shared_ptr<FrameLaneReceiver> lane_;  // a client's; set once, under `outMutex_` too

    std::atomic<bool> isAuthenticated_{false};
    std::atomic<bool> wasLookedAt_{false};  // by the loop
    std::atomic<bool> isHeldUp_{false};     // more was received than may wait
    std::atomic<bool> cannotSend_{false};   // the peer is gone, but what it sent before still counts
    std::atomic<bool> hasLane_{false};      // a server's
    std::mutex outMutex_;
    Out out_;
};

}  // namespace kelvo
