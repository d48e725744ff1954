#pragma once

#include <functional>
#include <memory>
#include <pulse/pulseaudio.h>
#include <string>
#include <vector>

namespace kelvo::pulse {

/// Holds the lock of a threaded main loop, under which alone libpulse's objects may be touched from other
/// threads than the loop's own.
class LoopLock {
  public:
    explicit LoopLock(pa_threaded_mainloop* loop) : loop_(loop) { pa_threaded_mainloop_lock(loop_); }
    ~LoopLock() { pa_threaded_mainloop_unlock(loop_); }
    LoopLock(const LoopLock&) = delete;
    LoopLock& operator=(const LoopLock&) = delete;

  private:
    pa_threaded_mainloop* loop_;
};

/// Requests that wait for the server's answer, so that they can be called off. Under the loop's lock.
class Operations {
  public:
    Operations() = default;
    ~Operations() { cancel(); }
    Operations(const Operations&) = delete;
    Operations& operator=(const Operations&) = delete;

    /// Takes `operation`, which may be none.
    void add(pa_operation* operation);
    /// None of the answers comes any more.
    void cancel();

  private:
    std::vector<pa_operation*> operations_;
};

/// Somebody who needs the server. Called on the loop's thread, under its lock.
class PulseClient {
  public:
    virtual ~PulseClient() = default;

    /// The server answers from now on.
    virtual void serverCame(pa_context* context) = 0;
    /// Everything that belonged to its connection is void.
    virtual void serverWent() = 0;
    /// The client leaves: it gives up what belongs to the connection.
    virtual void letGo() = 0;
    /// Something at the server changed: an event of sink inputs, sources or the server itself.
    virtual void serverChanged(pa_context* context, pa_subscription_event_type_t event,
                               std::uint32_t index) = 0;
};

/// The connection to the user's sound server, on a thread of its own, for as long as this object lives. A
/// server that is absent or goes away is tried again four times a second; the log says so once. Thread-safe,
/// but must not go on the loop's thread.
class PulseServer {
  public:
    PulseServer();
    ~PulseServer();
    PulseServer(const PulseServer&) = delete;
    PulseServer& operator=(const PulseServer&) = delete;

    /// `client` is called from now on, for the first time before this returns if the server is there.
    void add(PulseClient& client);
    /// Not called any more after the return.
    void remove(PulseClient& client);

    pa_threaded_mainloop* loop() const { return loop_; }

  private:
    static constexpr pa_usec_t kRetryInterval = 250000;

    void connect();
    void disconnect();
    void contextStateChanged();
    void contextIsReady();
    void contextFailed();
    void retryLater();

    pa_threaded_mainloop* const loop_;
    pa_context* context_ = nullptr;
    pa_time_event* retry_ = nullptr;
    Operations operations_;
    std::vector<PulseClient*> clients_;
    bool isReady_ = false;
    bool isAbsenceLogged_ = false;
};

}  // namespace kelvo::pulse
