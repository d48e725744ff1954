#include "session/KVRecordingSession.h"

#include <algorithm>
#include <array>
#include <cstdio>

namespace kelvo {
namespace {

/// A name that an application gave itself, as part of a file name: it must not lead into another directory.
std::string asFileName(std::string name) {
    std::ranges::replace(name, '/', '-');
    return name;
}

/// Six digits after the point, as "%f" prints.
std::string withMicroseconds(double seconds) {
    std::array<char, 64> text{};
    std::snprintf(text.data(), text.size(), "%f", seconds);
    return text.data();
}

}  // namespace

std::string KVRecordingSession::outputPath() const {
    const std::string directory = KVTemporaryFileStore::_srTempPath() + "/";
    const Date now = services_.platform.clock->now();
    if (broadcastExtension()) {
        return directory + "KVMovie_" + asFileName(bundleID_) + "_" +
               withMicroseconds(now.secondsSince1970()) + "_" + std::to_string(broadcastFragmentIndex_) +
               ".mp4";
    }
    if (systemRecording_)
        return directory + std::string(KVTemporaryFileStore::kScreenRecordingPrefix) +
               localTimeText(now, "%m-%d-%Y %H-%M-%S") + ".mp4";
    return directory + localizedAppName() + ".mp4";
}

bool KVRecordingSession::ownsMovie(const URL& movieURL) const {
    const auto name = KVTemporaryFileStore::nameInStore(movieURL);
    return name && (name == localizedAppName() + ".mp4" || name == localizedAppName() + "_trimmed.mp4");
}

bool KVRecordingSession::isWritingMovie(const URL& movieURL) const {
    const auto writer = movieWriter();
    const auto name = KVTemporaryFileStore::nameInStore(movieURL);
    return recording_ && writer && name && name == KVTemporaryFileStore::nameInStore(writer->outputURL());
}

std::string KVRecordingSession::trimmedOutputPath() const {
    return KVTemporaryFileStore::_srTempPath() + "/" + localizedAppName() + "_trimmed.mp4";
}

/// An application that cannot be found has the name that a missing text prints as.
std::string KVRecordingSession::localizedAppName() const {
    return asFileName(services_.localization->kvLocalizedAppNameFromBundleID(bundleID_).value_or("(null)"));
}

}  // namespace kelvo
