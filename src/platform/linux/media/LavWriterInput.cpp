#include "platform/linux/media/LavWriterInput.h"

#include <algorithm>
#include <cmath>
#include <utility>

namespace kelvo {
namespace {

/// Frames come from a bounded pool; sound comes in many small buffers.
constexpr int kMostQueuedFrames = 3;
constexpr int kMostQueuedAudioBuffers = 32;
/// Sound is encoded a few buffers at a time: the encoder's thread is woken less often and finds its tables in
/// the processor's cache, which saves a quarter of its work. After a crash the movie lacks that much more
/// sound, so it is less than a fragment of the file.
constexpr double kGatheredSeconds = 0.25;
constexpr std::size_t kMostGatheredBuffers = 16;

std::int32_t fixedPoint(double number, int fractionBits) {
    constexpr double kLimit = 2147483647;
    const double scaled = std::round(number * static_cast<double>(1 << fractionBits));
    return std::isnan(scaled) ? 0 : static_cast<std::int32_t>(std::clamp(scaled, -kLimit, kLimit));
}

TrackFormat::Matrix matrixFrom(const AffineTransform& transform) {
    TrackFormat::Matrix matrix = TrackFormat::kUpright;
    matrix[0] = fixedPoint(transform.a, 16);
    matrix[1] = fixedPoint(transform.b, 16);
    matrix[3] = fixedPoint(transform.c, 16);
    matrix[4] = fixedPoint(transform.d, 16);
    matrix[6] = fixedPoint(transform.tx, 16);
    matrix[7] = fixedPoint(transform.ty, 16);
    return matrix;
}

}  // namespace

void WriterSession::fail(const KVError& reason) {
    error.with([&](OptionalError& first) {
        if (!first) first = reason;
    });
    takesSamples = false;
    status = MediaFileWriter::Status::failed;
}

LavWriterInput::LavWriterInput(MediaType type, Dictionary outputSettings)
    : type_(type),
      outputSettings_(std::move(outputSettings)),
      encoder_(makeSampleEncoder(type)),
      queue_(type == MediaType::video ? "com.quillon.KelvoKit.VideoEncoder"
                                      : "com.quillon.KelvoKit.AudioEncoder") {}

Result<TrackFormat> LavWriterInput::open(std::shared_ptr<WriterSession> session, std::size_t track) {
    // The handler runs while the session is held by whoever encodes; holding it here would make a circle.
    auto format = encoder_->open(
        outputSettings_,
        [raw = session.get(), track](const SampleTiming& timing, std::span<const std::byte> data) {
            raw->muxer->append(track, timing, data);
        });
    session_.set(std::move(session));
    if (format && type_ == MediaType::video) format->matrix = matrixFrom(transform());
    return format;
}

bool LavWriterInput::isReadyForMoreMediaData() const {
    const auto session = session_.copy();
    const int most = type_ == MediaType::video ? kMostQueuedFrames : kMostQueuedAudioBuffers;
    return session && session->status == MediaFileWriter::Status::writing && session->takesSamples &&
           queued_ < most;
}

bool LavWriterInput::append(const SampleBufferRef& sample) {
    const auto session = session_.copy();
    if (!session || !session->takesSamples || sample->isVideo() != (type_ == MediaType::video)) return false;
    const std::lock_guard lock(appending_);
    SampleEncoder::Work work = encoder_->take(sample, session->timeline);
    if (!work) return true;
    ++queued_;
    if (gathered_.empty()) gatheredSince_ = sample->presentationTime();
    gathered_.push_back(std::move(work));
    if (!isGathering(*sample)) queueGathered();
    return true;
}

bool LavWriterInput::isGathering(const SampleBuffer& sample) const {
    const double seconds = (sample.presentationTime() - gatheredSince_).seconds();
    return type_ == MediaType::audio && gathered_.size() < kMostGatheredBuffers &&
           std::abs(seconds) < kGatheredSeconds;
}

void LavWriterInput::queueGathered() {
    queue_.async([this, gathered = std::exchange(gathered_, {})] {
        for (const SampleEncoder::Work& work : gathered) {
            encode(work);
            --queued_;
        }
    });
}

bool LavWriterInput::isEncoding() const {
    const auto session = session_.copy();
    return !isFlushed_ && session && !session->isAbandoned &&
           session->status == MediaFileWriter::Status::writing;
}

void LavWriterInput::encode(const SampleEncoder::Work& work) {
    if (!isEncoding()) return;
    if (const OptionalError error = work()) session_.copy()->fail(*error);
}

void LavWriterInput::flush() {
    {
        const std::lock_guard lock(appending_);
        queueGathered();
    }
    queue_.sync([this] {
        if (!isEncoding()) return;
        isFlushed_ = true;
        const auto session = session_.copy();
        if (const OptionalError error = encoder_->flush(session->timeline)) session->fail(*error);
    });
}

}  // namespace kelvo
