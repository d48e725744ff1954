#pragma once

#include "base/SampleBuffer.h"
#include "base/URL.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

namespace kelvo {

/// What a session tells its broadcast extension about itself, with the numbers that extensions see.
enum class ExtensionAction : std::int64_t { start = 1, pause = 2, resume = 3, finish = 4 };

/// How a broadcast reaches its extension.
enum class BroadcastProcessMode : std::int64_t {
    movieClips = 0,     ///< finished fragments of the movie
    sampleBuffers = 1,  ///< every sample as it comes
};

/// A session's way to its broadcast extension. A session that has one broadcasts. Called on the threads of
/// the samples and of the session's owner; thread-safe. What cannot be delivered is dropped; a broken link
/// shows as an error that ends the session.
class BroadcastExtensionLink {
  public:
    virtual ~BroadcastExtensionLink() = default;

    /// `completion` always runs: when the extension has taken the action, or at once in movie-clip mode and
    /// while no extension can be reached.
    virtual void notifyExtensionOfAction(ExtensionAction action, std::function<void()> completion) = 0;
    virtual void notifyExtensionOfVideoSampleBuffer(const SampleBufferRef& sample, SampleBuffer::Type type,
                                                    std::uint32_t sampleOrientation) = 0;
    virtual void notifyExtensionOfAudioSampleBuffer(const SampleBufferRef& sample,
                                                    SampleBuffer::Type type) = 0;
    virtual void notifyExtensionOfFrontmostProcessBundleID(const std::string& bundleID) = 0;

    /// Movie-clip mode: appends application audio to the current fragment and begins the next fragment when
    /// this one is long enough.
    virtual void processAudioSampleBufferForMP4ClipHandler(const SampleBufferRef& sample) = 0;
    /// Movie-clip mode: hands a completed fragment over; none when it could not be written. `finished` says
    /// that it is the last.
    virtual void notifyBroadcastExtensionOfCompletedMovieWithURL(const std::optional<URL>& url,
                                                                 bool finished) = 0;

    /// Ends the connection for good.
    virtual void invalidateConnection() = 0;
};

}  // namespace kelvo
