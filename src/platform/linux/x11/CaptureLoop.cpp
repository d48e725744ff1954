#include "platform/linux/x11/CaptureLoop.h"

#include "base/KVLog.h"
#include "platform/linux/x11/RootPicture.h"
#include "platform/linux/x11/WindowsPicture.h"
#include "platform/linux/x11/XHandshake.h"

#include <algorithm>
#include <array>
#include <ctime>
#include <poll.h>
#include <utility>
#include <xcb/damage.h>
#include <xcb/xfixes.h>

namespace kelvo::x11 {
namespace {

constexpr std::size_t kSurfaces = 8;
/// While a frame waits for its turn, later drawing is noticed this often at most, so that the frame's time is
/// that of the drawing it shows and yet a program that draws without pause does not keep us busy.
constexpr std::chrono::milliseconds kLeastArmingGap{2};
constexpr std::int32_t kNanoseconds = 1000000000;

std::chrono::nanoseconds monotonicNow() {
    return std::chrono::steady_clock::now().time_since_epoch();
}

}  // namespace

CaptureLoop::CaptureLoop(CaptureSettings settings)
    : settings_(std::move(settings)), pacer_(settings_.interval) {
    settings_.mirroring->addListener(mirroringEvent_);
}

void CaptureLoop::stop() {
    stopped_ = true;
    stopEvent_.set();
}

std::optional<ScreenCaptureStatus> CaptureLoop::run() {
    if (stopEvent_.descriptor() < 0 || mirroringEvent_->descriptor() < 0)
        return ScreenCaptureStatus::exhausted;
    while (!stopped_) {
        mirroringEvent_->clear();
        if (!begin()) return stopped_ ? std::nullopt : std::optional(ScreenCaptureStatus::unreachable);
        const auto failure = watchPicture();
        pool_.reset();
        picture_.reset();
        connection_.reset();
        if (failure) return stopped_ ? std::nullopt : failure;
    }
    return std::nullopt;
}

/// A connection of its own for each picture: what a picture made on the server goes with it, whatever
/// happened.
bool CaptureLoop::begin() {
    connection_ = XConnection::open(settings_.display, stopEvent_.descriptor());
    if (!connection_) return cannotCapture(unreachableText(displayName(settings_.display)));
    if (!connection_->drawsBGRx())
        return cannotCapture("the display's pixels are not of 32 bits, blue first");
    if (!hasExtensions()) return cannotCapture("the display lacks MIT-SHM 1.2, DAMAGE or XFIXES");
    picture_ = makePicture(settings_.mirroring->current());
    if (picture_ && !picture_->watch()) return false;
    firstChange_.reset();
    isArmed_ = false;
    if (picture_) firstChange_ = lastChange_ = monotonicNow();
    return !connection_->isBroken();
}

/// Whoever is told of the failure learns no more than that there is one.
bool CaptureLoop::cannotCapture(const std::string& reason) const {
    if (!stopped_) KVLogError("cannot record the screen: %s", reason.c_str());
    return false;
}

bool CaptureLoop::hasExtensions() {
    xcb_connection_t* const c = connection_->raw();
    for (xcb_extension_t* const extension : {&xcb_shm_id, &xcb_damage_id, &xcb_xfixes_id}) {
        if (!connection_->hasExtension(*extension)) return false;
    }
    const auto damageAsked = xcb_damage_query_version(c, 1, 1);
    const auto fixesAsked = xcb_xfixes_query_version(c, 4, 0);
    const auto shmAsked = xcb_shm_query_version(c);
    const auto damage = connection_->await<xcb_damage_query_version_reply_t>(damageAsked);
    const auto fixes = connection_->await<xcb_xfixes_query_version_reply_t>(fixesAsked);
    const auto shm = connection_->await<xcb_shm_query_version_reply_t>(shmAsked);
    // Segments that are memory files came with version 1.2.
    return damage && fixes && shm && (shm->major_version > 1 || shm->minor_version >= 2);
}

std::unique_ptr<XPicture> CaptureLoop::makePicture(const Mirroring& mirroring) {
    switch (mirroring.mode) {
        case MirroringMode::wholeScreen:
            return std::make_unique<RootPicture>(*connection_, settings_.size);
        case MirroringMode::cloneContexts:
            return std::make_unique<WindowsPicture>(*connection_, settings_.size, mirroring.contexts);
        case MirroringMode::off:
            break;
    }
    return nullptr;
}

/// Delivers frames until the mirroring changes or the loop is stopped, or says why it cannot.
std::optional<ScreenCaptureStatus> CaptureLoop::watchPicture() {
    while (!stopped_) {
        Time now = monotonicNow();
        takeEvents(now);
        if (connection_->isBroken()) return ScreenCaptureStatus::lost;
        std::optional<Time> wake;
        if (firstChange_) {
            const Time due = pacer_.due(*firstChange_);
            if (due <= now) {
                if (const auto failure = captureFrame(due, now)) return failure;
                continue;
            }
            rearmWhenDue(now);
            wake = isArmed_ ? due : std::min(due, nextArming_);
        }
        if (!sleep(wake)) break;
    }
    return std::nullopt;
}

/// Takes in what the server has told. `subtracted` is the request by which the frame just taken asked for
/// later drawing, 0 when no frame was: drawing told before it is in that frame.
void CaptureLoop::takeEvents(Time now, unsigned subtracted) {
    while (const XOwned<xcb_generic_event_t> event{xcb_poll_for_event(connection_->raw())}) {
        if (!picture_ || event->response_type == 0 || !picture_->handle(*event)) continue;
        if (subtracted != 0 && static_cast<std::int32_t>(event->full_sequence - subtracted) < 0) {
            frameTime_ = now;
            continue;
        }
        isArmed_ = false;
        lastChange_ = now;
        if (!firstChange_) firstChange_ = now;
    }
}

void CaptureLoop::rearmWhenDue(Time now) {
    if (isArmed_ || now < nextArming_) return;
    picture_->rearm();
    isArmed_ = true;
    nextArming_ = now + kLeastArmingGap;
}

std::optional<ScreenCaptureStatus> CaptureLoop::captureFrame(Time due, Time now) {
    pacer_.captured(due, now);
    preparePool();
    const auto surface = pool_->take();
    if (!surface) return failure();
    if (!*surface) {
        ++*settings_.skippedFrames;
        return std::nullopt;  // still to be captured: it is tried again one interval later
    }
    const unsigned subtracted = picture_->rearm();
    if (!picture_->grab({**surface, pool_->segmentOf(**surface)})) return std::nullopt;
    isArmed_ = true;
    firstChange_.reset();
    frameTime_ = lastChange_;
    takeEvents(monotonicNow(), subtracted);
    deliver(*surface);
    return std::nullopt;
}

ScreenCaptureStatus CaptureLoop::failure() const {
    return connection_->isBroken() ? ScreenCaptureStatus::lost : ScreenCaptureStatus::exhausted;
}

void CaptureLoop::preparePool() {
    const VideoSurface::Geometry geometry = picture_->refresh();
    if (pool_ && pool_->geometry() == geometry) return;
    pool_.reset();
    pool_ = std::make_unique<ShmSurfacePool>(*connection_, geometry, kSurfaces);
}

void CaptureLoop::deliver(VideoSurfaceRef surface) {
    if (stopped_) return;
    lastDelivered_ = std::max(frameTime_, lastDelivered_ + Time(1));
    const TimingRecord timing{MediaTime::invalid(), MediaTime::make(lastDelivered_.count(), kNanoseconds),
                              MediaTime::invalid()};
    settings_.deliver(SampleBuffer::video(std::move(surface), timing));
}

/// Waits for something to happen, at most until `until`. False when this picture is to be left.
bool CaptureLoop::sleep(std::optional<Time> until) {
    xcb_flush(connection_->raw());
    std::array<pollfd, 3> waits{{{xcb_get_file_descriptor(connection_->raw()), POLLIN, 0},
                                 {stopEvent_.descriptor(), POLLIN, 0},
                                 {mirroringEvent_->descriptor(), POLLIN, 0}}};
    timespec limit{};
    if (until) {
        const auto left = std::max(*until - monotonicNow(), Time(0));
        const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(left);
        limit = {seconds.count(), (left - seconds).count()};
    }
    const int ready = ::ppoll(waits.data(), waits.size(), until ? &limit : nullptr, nullptr);
    return ready <= 0 || (waits[1].revents == 0 && waits[2].revents == 0);
}

}  // namespace kelvo::x11
