#include "ipc/KVBroadcastConfigurationCoding.h"
#include "kit/Conversions.h"
#include "kit/RecorderCore.h"

// Handlers are kept beyond the call: each is taken as a copy.
// NOLINTBEGIN(performance-unnecessary-value-param)

namespace kelvokit {
namespace {

bool flagIn(const kelvo::Dictionary& state, std::string_view key) {
    const kelvo::Value* value = state.find(key);
    return value != nullptr && value->asBool().value_or(false);
}

/// What calls a handler that takes an error alone.
std::function<void(const Error&)> failure(const Recorder::DoneHandler& handler) {
    if (!handler) return nullptr;
    return [handler](const Error& error) { handler(error); };
}

}  // namespace

void Recorder::Core::start(Kind kind, const RecordingOptions& options, StartHandler handler) {
    const auto answered = [weakSelf = weak_from_this(), kind, handler](const kelvo::OptionalError& error,
                                                                       bool microphone, bool camera) {
        const auto self = weakSelf.lock();
        if (!self) return;
        if (!error) {
            self->changeState([&](RecorderState& state) {
                if (!state.isRecording) state.isPaused = false;
                state.isRecording = true;
                state.isBroadcasting = kind == Kind::broadcast;
                state.isMicrophoneEnabled = microphone;
            });
        }
        if (handler) self->post([=, error = publicError(error)] { handler(error, microphone, camera); });
    };
    request(
        [&](kelvo::KVRemoteDaemon& daemon) {
            daemon.startRecordingWindowLayerContextIDs(
                options.windows, {options.width, options.height}, options.microphone, options.camera,
                kind == Kind::broadcast, false, kind == Kind::capture, nullptr, answered);
        },
        [handler](const Error& error) {
            if (handler) handler(error, false, false);
        });
}

void Recorder::Core::stop(double startClipDuration, double endClipDuration, MovieHandler handler) {
    const auto answered = [weakSelf = weak_from_this(), handler](const std::optional<kelvo::URL>& movieURL,
                                                                 const kelvo::OptionalError& error) {
        const auto self = weakSelf.lock();
        if (!self) return;
        self->ended();
        if (!handler) return;
        self->post(
            [handler, movie = publicPath(movieURL), error = publicError(error)] { handler(movie, error); });
    };
    request(
        [&](kelvo::KVRemoteDaemon& daemon) {
            daemon.stopRecordingWithStartClipDuration(startClipDuration, endClipDuration, answered);
        },
        [handler](const Error& error) {
            if (handler) handler(std::nullopt, error);
        });
}

void Recorder::Core::pause() {
    tell([](kelvo::KVRemoteDaemon& daemon) { daemon.pauseRecording(); });
    changeState([](RecorderState& state) { state.isPaused = state.isRecording; });
}

void Recorder::Core::resume(std::uint32_t window) {
    tell([&](kelvo::KVRemoteDaemon& daemon) { daemon.resumeRecordingWithWindowLayerContextID(window); });
    changeState([](RecorderState& state) { state.isPaused = false; });
}

void Recorder::Core::setMicrophoneEnabled(bool isEnabled) {
    tell([&](kelvo::KVRemoteDaemon& daemon) { daemon.setMicrophoneEnabled(isEnabled); });
    changeState([&](RecorderState& state) { state.isMicrophoneEnabled = state.isRecording && isEnabled; });
}

/// The daemon says nothing to a discard while it records, so it is not asked.
void Recorder::Core::discard(DoneHandler handler) {
    if (state().isRecording) {
        if (handler)
            post([handler, error = localError(ErrorCode::failed, "still recording")] { handler(error); });
        return;
    }
    const auto answered = [weakSelf = weak_from_this(), handler] {
        const auto self = weakSelf.lock();
        if (self && handler) self->post([handler] { handler(std::nullopt); });
    };
    request([&](kelvo::KVRemoteDaemon& daemon) { daemon.discardRecordingWithHandler(answered); },
            failure(handler));
}

void Recorder::Core::save(const std::string& movie, DoneHandler handler) {
    const auto answered = [weakSelf = weak_from_this(), handler](const kelvo::OptionalError& error) {
        const auto self = weakSelf.lock();
        if (self && handler) self->post([handler, error = publicError(error)] { handler(error); });
    };
    request(
        [&](kelvo::KVRemoteDaemon& daemon) {
            daemon.saveVideoToCameraRoll(kelvo::URL::file(movie), answered);
        },
        failure(handler));
}

void Recorder::Core::setUpBroadcast(const BroadcastOptions& options, DoneHandler handler) {
    kelvo::KVBroadcastConfiguration configuration;
    configuration.setClipDuration(options.clipDuration);
    configuration.setVideoCompressionProperties(wireDictionary(options.videoCompressionProperties));
    const auto answered = [weakSelf = weak_from_this(), handler](const kelvo::OptionalError& error) {
        const auto self = weakSelf.lock();
        if (self && handler) self->post([handler, error = publicError(error)] { handler(error); });
    };
    request(
        [&](kelvo::KVRemoteDaemon& daemon) {
            daemon.setupBroadcastWithHostBundleID(
                options.hostBundleID, options.extensionBundleID,
                kelvo::archivedData<kelvo::KVBroadcastConfigurationCoding>(configuration),
                wireDictionary(options.userInfo), answered);
        },
        failure(handler));
}

void Recorder::Core::getBroadcastImages(ImagesHandler handler) {
    if (!handler) return;
    const auto answered = [weakSelf = weak_from_this(), handler](
                              const std::optional<kelvo::Bytes>& host,
                              const std::optional<kelvo::Bytes>& extension) {
        const auto self = weakSelf.lock();
        if (!self) return;
        self->post(
            [handler, host = host.value_or(kelvo::Bytes()), extension = extension.value_or(kelvo::Bytes())] {
                handler(host, extension, std::nullopt);
            });
    };
    request([&](kelvo::KVRemoteDaemon& daemon) { daemon.getCurrentBroadcastImages(answered); },
            [handler](const Error& error) { handler({}, {}, error); });
}

void Recorder::Core::getBroadcastExtensions(ExtensionsHandler handler) {
    if (!handler) return;
    const auto answered = [weakSelf = weak_from_this(), handler](
                              const std::vector<kelvo::Dictionary>& extensions,
                              const kelvo::OptionalError& error) {
        const auto self = weakSelf.lock();
        if (!self) return;
        std::vector<Dictionary> found;
        found.reserve(extensions.size());
        for (const kelvo::Dictionary& each : extensions)
            found.push_back(publicDictionary(each));
        self->post([handler, found, error = publicError(error)] { handler(found, error); });
    };
    request([&](kelvo::KVRemoteDaemon& daemon) { daemon.getSystemBroadcastExtensionInfo(answered); },
            [handler](const Error& error) { handler({}, error); });
}

void Recorder::Core::isBroadcasting(const std::string& extensionBundleID, BooleanHandler handler) {
    if (!handler) return;
    const auto answered = [weakSelf = weak_from_this(), handler](bool value) {
        if (const auto self = weakSelf.lock()) self->post([handler, value] { handler(value, std::nullopt); });
    };
    request(
        [&](kelvo::KVRemoteDaemon& daemon) {
            daemon.synchronousIsBroadcastingWithPreferredExtension(extensionBundleID, answered);
        },
        [handler](const Error& error) { handler(false, error); });
}

void Recorder::Core::setBroadcastURL(const std::string& url) {
    tell([&](kelvo::KVRemoteDaemon& daemon) { daemon.setBroadcastURL(kelvo::URL(url)); });
}

/// The daemon does not tell whether a recording is paused.
void Recorder::Core::refreshState() {
    const auto answered = [weakSelf = weak_from_this()](const std::optional<kelvo::Dictionary>& told) {
        const auto self = weakSelf.lock();
        if (!self) return;
        const kelvo::Dictionary known = told.value_or(kelvo::Dictionary());
        self->changeState([&](RecorderState& state) {
            state.isRecording = flagIn(known, "isRecording");
            state.isPaused = state.isPaused && state.isRecording;
            state.isBroadcasting = flagIn(known, "isBroadcasting");
            state.isMicrophoneEnabled = state.isRecording && flagIn(known, "microphoneEnabled");
        });
    };
    tell([&](kelvo::KVRemoteDaemon& daemon) { daemon.synchronousGetCurrentState(answered); });
}

}  // namespace kelvokit

// NOLINTEND(performance-unnecessary-value-param)
