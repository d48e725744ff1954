#pragma once

#include "base/KVError.h"
#include "base/MediaRecords.h"
#include "base/VideoSurface.h"

#include <kelvokit/Recorder.h>
#include <optional>
#include <string>
#include <vector>

/// Between the types that programs see and those that travel.
namespace kelvokit {

struct Frame::Content {
    kelvo::VideoSurfaceRef surface;
    kelvo::MediaTime time;
};

struct AudioBuffer::Content {
    kelvo::Bytes bytes;
    kelvo::AudioFormatRecord format;
    std::int64_t frameCount = 0;
    Source source = Source::application;
    kelvo::MediaTime time;
};

Error publicError(const kelvo::KVError& error);
std::optional<Error> publicError(const kelvo::OptionalError& error);
std::optional<std::string> publicPath(const std::optional<kelvo::URL>& movie);
Dictionary publicDictionary(const kelvo::Dictionary& dictionary);
kelvo::Dictionary wireDictionary(const Dictionary& dictionary);

}  // namespace kelvokit
