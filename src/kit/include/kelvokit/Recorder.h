#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <kelvokit/Error.h>
#include <kelvokit/Export.h>
#include <kelvokit/Samples.h>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <variant>
#include <vector>

namespace kelvokit {

/// What extensions and the daemon tell beside the requests. Entries of other types are left out.
using Value = std::variant<bool, std::int64_t, double, std::string, std::vector<std::byte>>;
using Dictionary = std::map<std::string, Value>;

/// Where handlers run: it is given one task at a time, in their order, and runs or queues it. It must keep
/// the order and must not run two at once. Called from threads of the library.
using Executor = std::function<void(std::function<void()>)>;

struct RecorderOptions {
    /// The daemon's socket. Empty: the environment's KELVO_SOCKET, else the one of the user's own daemon,
    /// $XDG_RUNTIME_DIR/kelvod/com.quillon.kelvod, if it is there, else /run/kelvod/com.quillon.kelvod.
    std::string socketPath;
    /// Empty: threads of the library, one at a time.
    Executor executor;
};

/// What is to be recorded.
struct RecordingOptions {
    /// The identifiers of the application's own windows (X11 windows).
    std::vector<std::uint32_t> windows;
    /// The size of the recorded area, in points.
    double width = 0;
    double height = 0;
    bool microphone = false;
    bool camera = false;
};

/// What the daemon does for this application.
struct RecorderState {
    bool isConnected = false;
    bool isRecording = false;  ///< also while it captures or broadcasts, and while paused
    bool isPaused = false;
    bool isBroadcasting = false;
    bool isMicrophoneEnabled = false;

    friend bool operator==(const RecorderState&, const RecorderState&) = default;
};

/// What a broadcast extension is to get.
struct BroadcastOptions {
    std::string hostBundleID;
    std::string extensionBundleID;
    /// Of one movie clip, in seconds; must be finite.
    double clipDuration = 5;
    Dictionary videoCompressionProperties;
    Dictionary userInfo;
};

/// An application's recorder: records, captures and broadcasts its own windows through the daemon, which asks
/// the user for consent.
///
/// Thread-safe. Operations return at once; handlers run on the executor. A handler of a request runs once at
/// most, and not at all when the recorder goes first; an empty one is allowed. When the daemon is not there,
/// requests fail with `ErrorCode::connectionInvalid`; when it goes while one is under way, with
/// `ErrorCode::connectionInterrupted`. The recorder then looks for the daemon again, at first after a tenth
/// of a second and at last every five, and every request looks at once. A recording does not survive the
/// daemon that made it.
///
/// Without an executor of the program's, handlers run one at a time on threads of the library. One may take
/// its time and destroy the recorder, but not wait for another handler of the same recorder, which has its
/// turn only then.
///
/// Once the destructor returns no handler runs, but for one from which it was called. It waits for a handler
/// that runs on another thread; the end of the process does not.
class KELVOKIT_EXPORT Recorder {
  public:
    using StartHandler = std::function<void(const std::optional<Error>& error, bool microphone, bool camera)>;
    /// The movie is a path on this machine, and stays there until it is saved or discarded.
    using MovieHandler =
        std::function<void(const std::optional<std::string>& movie, const std::optional<Error>& error)>;
    using DoneHandler = std::function<void(const std::optional<Error>& error)>;
    using ImagesHandler =
        std::function<void(const std::vector<std::byte>& host, const std::vector<std::byte>& extension,
                           const std::optional<Error>& error)>;
    using ExtensionsHandler =
        std::function<void(const std::vector<Dictionary>& extensions, const std::optional<Error>& error)>;
    using BooleanHandler = std::function<void(bool value, const std::optional<Error>& error)>;

    explicit Recorder(RecorderOptions options = {});
    ~Recorder();
    Recorder(const Recorder&) = delete;
    Recorder& operator=(const Recorder&) = delete;

    // Requests.

    /// Records the windows into a movie. The user may be asked first, and may leave the microphone out: the
    /// handler says what is recorded. Starting while it records already is a success and changes nothing.
    void start(const RecordingOptions& options, StartHandler handler = {});
    /// Hands frames and sound to `onFrame` and `onAudio` instead of writing a movie.
    void startCapture(const RecordingOptions& options, StartHandler handler = {});
    /// Streams to the extension that was set up with `setUpBroadcast`.
    void startBroadcast(const RecordingOptions& options, StartHandler handler = {});

    /// Ends what was started. A capture and a broadcast leave no movie.
    void stop(MovieHandler handler = {});
    /// The same without the movie's first and last seconds, when both are more than 0, rounded to whole
    /// seconds. When the movie cannot be cut the handler does not run.
    void stop(double startClipDuration, double endClipDuration, MovieHandler handler = {});
    /// Nothing happens when nothing is recorded. No handler: `onState` tells.
    void pause();
    /// Goes on, with this window.
    void resume(std::uint32_t window);
    /// For the recording that runs. Nothing happens when none does.
    void setMicrophoneEnabled(bool isEnabled);
    /// Deletes the movie that the last recording left. While one is recorded it fails with
    /// `ErrorCode::failed`.
    void discard(DoneHandler handler = {});
    /// Saves a movie that `stop` gave into the user's library, and deletes it.
    void save(const std::string& movie, DoneHandler handler = {});

    /// Needs a right of the application's bundle, else `ErrorCode::broadcastSetupRefused`.
    void setUpBroadcast(const BroadcastOptions& options, DoneHandler handler = {});
    /// The icons of who broadcasts and of the extension, as PNG; empty when there is none.
    void getBroadcastImages(ImagesHandler handler);
    void getBroadcastExtensions(ExtensionsHandler handler);
    void isBroadcasting(const std::string& extensionBundleID, BooleanHandler handler);
    void setBroadcastURL(const std::string& url);

    /// Asks the daemon for its state; `onState` tells when it is another.
    void refreshState();
    /// What was last known.
    RecorderState state() const;
    /// Captured sound that was dropped because the executor fell behind; buffers since the recorder was made.
    std::uint64_t droppedAudioBuffers() const;

    // What the daemon tells. Each replaces the handler before it; an empty one removes it.

    void onState(std::function<void(const RecorderState&)> handler);
    /// The recording ended by itself, and why; the movie when there is one.
    void onStop(MovieHandler handler);
    /// The device locked.
    void onLock(std::function<void(const Error&)> handler);
    /// A paused recording may be resumed.
    void onShouldResume(std::function<void()> handler);
    /// The recording's timer, as text.
    void onTimer(std::function<void(const std::string&)> handler);
    void onFrame(std::function<void(const Frame&)> handler);
    void onAudio(std::function<void(const AudioBuffer&)> handler);
    void onBroadcastInfo(std::function<void(const Dictionary&)> handler);
    void onBroadcastURL(std::function<void(const std::string&)> handler);
    /// The daemon was lost (`ErrorCode::connectionInterrupted`), with whatever it recorded for this
    /// application.
    void onConnectionLost(std::function<void(const Error&)> handler);
    /// It was found again.
    void onConnectionRestored(std::function<void()> handler);

  private:
    class KELVOKIT_HIDDEN Core;
    friend struct RecorderTestAccess;
    KELVOKIT_HIDDEN explicit Recorder(std::shared_ptr<Core> core);
    std::shared_ptr<Core> core_;
};

}  // namespace kelvokit
