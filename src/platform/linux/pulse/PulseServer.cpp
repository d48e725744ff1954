#include "platform/linux/pulse/PulseServer.h"

#include "base/KVLog.h"

#include <utility>

namespace kelvo::pulse {

void Operations::add(pa_operation* operation) {
    std::erase_if(operations_, [](pa_operation* known) {
        if (pa_operation_get_state(known) == PA_OPERATION_RUNNING) return false;
        pa_operation_unref(known);
        return true;
    });
    if (operation != nullptr) operations_.push_back(operation);
}

void Operations::cancel() {
    for (pa_operation* operation : operations_) {
        pa_operation_cancel(operation);
        pa_operation_unref(operation);
    }
    operations_.clear();
}

PulseServer::PulseServer() : loop_(pa_threaded_mainloop_new()) {
    pa_threaded_mainloop_set_name(loop_, "kelvo.pulse");
    connect();
    pa_threaded_mainloop_start(loop_);
}

PulseServer::~PulseServer() {
    pa_threaded_mainloop_lock(loop_);
    disconnect();
    pa_threaded_mainloop_unlock(loop_);
    pa_threaded_mainloop_stop(loop_);
    pa_threaded_mainloop_free(loop_);
}

void PulseServer::add(PulseClient& client) {
    const LoopLock lock(loop_);
    clients_.push_back(&client);
    if (isReady_) client.serverCame(context_);
}

void PulseServer::remove(PulseClient& client) {
    const LoopLock lock(loop_);
    std::erase(clients_, &client);
    client.letGo();
}

/// Before the loop's thread starts, or under its lock.
void PulseServer::connect() {
    context_ = pa_context_new(pa_threaded_mainloop_get_api(loop_), "kelvod");
    const auto changed = [](pa_context*, void* self) {
        static_cast<PulseServer*>(self)->contextStateChanged();
    };
    pa_context_set_state_callback(context_, changed, this);
    // A failure shows in the state as well, but for one that precedes the first change.
    if (pa_context_connect(context_, nullptr, PA_CONTEXT_NOAUTOSPAWN, nullptr) < 0) contextFailed();
}

void PulseServer::disconnect() {
    if (retry_ != nullptr) pa_threaded_mainloop_get_api(loop_)->time_free(retry_);
    retry_ = nullptr;
    operations_.cancel();
    pa_context_set_state_callback(context_, nullptr, nullptr);
    pa_context_set_subscribe_callback(context_, nullptr, nullptr);
    pa_context_disconnect(context_);
    pa_context_unref(context_);
    context_ = nullptr;
}

void PulseServer::contextStateChanged() {
    switch (pa_context_get_state(context_)) {
        case PA_CONTEXT_READY:
            contextIsReady();
            break;
        case PA_CONTEXT_FAILED:
        case PA_CONTEXT_TERMINATED:
            contextFailed();
            break;
        default:
            break;
    }
}

void PulseServer::contextIsReady() {
    isReady_ = true;
    isAbsenceLogged_ = false;
    KVLog("connected to the sound server %s", pa_context_get_server(context_));
    const auto changed = [](pa_context* context, pa_subscription_event_type_t event, std::uint32_t index,
                            void* self) {
        for (PulseClient* client : static_cast<PulseServer*>(self)->clients_)
            client->serverChanged(context, event, index);
    };
    pa_context_set_subscribe_callback(context_, changed, this);
    constexpr auto kInterests = static_cast<pa_subscription_mask_t>(
        PA_SUBSCRIPTION_MASK_SINK_INPUT | PA_SUBSCRIPTION_MASK_SOURCE | PA_SUBSCRIPTION_MASK_SERVER);
    operations_.add(pa_context_subscribe(context_, kInterests, nullptr, nullptr));
    for (PulseClient* client : clients_)
        client->serverCame(context_);
}

void PulseServer::contextFailed() {
    if (retry_ != nullptr) return;
    if (!isAbsenceLogged_) {
        KVLogError("%s the sound server (%s); recording goes on without sound until it is there",
                   isReady_ ? "lost" : "cannot reach", pa_strerror(pa_context_errno(context_)));
    }
    isAbsenceLogged_ = true;
    if (std::exchange(isReady_, false)) {
        for (PulseClient* client : clients_)
            client->serverWent();
    }
    retryLater();
}

/// The failed context cannot go in its own callback.
void PulseServer::retryLater() {
    const auto retry = [](pa_mainloop_api*, pa_time_event*, const timeval*, void* data) {
        auto* self = static_cast<PulseServer*>(data);
        self->disconnect();
        self->connect();
    };
    retry_ = pa_context_rttime_new(context_, pa_rtclock_now() + kRetryInterval, retry, this);
}

}  // namespace kelvo::pulse
