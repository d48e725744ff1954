#include "media/KVMovieWriter.h"

#include "base/KVLog.h"
#include "media/MovieOutputSettings.h"
#include "platform/MediaSettings.h"

namespace kelvo {
namespace {

constexpr std::string_view kBitRateOverrideKey = "KVBitRateOverride";

}  // namespace

std::shared_ptr<KVMovieWriter> KVMovieWriter::create(const Size& windowSize, std::string outputPath,
                                                     Services services) {
    // The constructor is private, so that a writer is always shared.
    return std::shared_ptr<KVMovieWriter>(
        new KVMovieWriter(windowSize, std::move(outputPath), std::move(services)));
}

KVMovieWriter::KVMovieWriter(const Size& windowSize, std::string outputPath, Services services)
    : windowSize_(windowSize),
      outputPath_(std::move(outputPath)),
      services_(std::move(services)),
      video_(services_.media->createBufferQueue()),
      audio1_(services_.media->createBufferQueue()),
      audio2_(services_.media->createBufferQueue()),
      movieWriterQueue_("com.quillon.KelvoKit.KVMovieWriterQueue") {}

void KVMovieWriter::Track::reset() {
    bufferQueue->reset();
    lastPresentationTime.set(MediaTime::invalid());
}

void KVMovieWriter::startWritingHandler(StartHandler handler) {
    movieWriterQueue_.async([self = shared_from_this(), handler = std::move(handler)] {
        self->dispatchedStartWritingHandler(handler);
    });
}

void KVMovieWriter::dispatchedStartWritingHandler(StartHandler handler) {
    KVLog("KVMovieWriter: startWritingHandler");
    services_.store->_srRemoveFile(
        outputURL(), [self = shared_from_this(), handler = std::move(handler)](const OptionalError&) {
            self->dispatchedSetupAssetWriter();
            if (handler) handler();
        });
}

void KVMovieWriter::setupAssetWriter() {
    movieWriterQueue_.sync([this] { dispatchedSetupAssetWriter(); });
}

void KVMovieWriter::dispatchedSetupAssetWriter() {
    KVLog("KVMovieWriter: setupAssetWriter");
    for (Track* track : {&video_, &audio1_, &audio2_})
        track->reset();
    const auto writer = services_.media->createFileWriter(outputURL(), MediaFileType::mpeg4);
    assetWriter_.set(writer.valueOr(nullptr));
    if (!writer) {
        KVLogError("KVMovieWriter: setupAssetWriter error: %i", static_cast<int>(writer.error().code()));
        return;
    }
    addInput(video_, MediaType::video, videoOutputSettings(windowSize_, compressionProperties()));
    const Dictionary audioSettings = audioOutputSettings();
    addInput(audio1_, MediaType::audio, audioSettings);
    addInput(audio2_, MediaType::audio, audioSettings);
}

std::int64_t KVMovieWriter::videoBitRate() const {
    const Value override = services_.preferences->value(kBitRateOverrideKey, kPreferencesDomain);
    if (!override.isNothing()) return override.asInteger().value_or(0);
    return defaultVideoBitRate(services_.device->idiom(), windowSize_);
}

Dictionary KVMovieWriter::compressionProperties() const {
    const std::int64_t bitRate = videoBitRate();
    KVLog("bit rate set to %ld", static_cast<long>(bitRate));
    Dictionary properties = videoCompressionProperties(bitRate);
    const auto configuration = broadcastConfig();
    if (configuration && configuration->videoCompressionProperties()) {
        KVLog("using custom video compression properties");
        properties.merge(*configuration->videoCompressionProperties());
    }
    return properties;
}

void KVMovieWriter::addInput(Track& track, MediaType type, const Dictionary& settings) {
    const std::shared_ptr<WriterInput> input = services_.media->createWriterInput(type, settings);
    input->setExpectsMediaDataInRealTime(true);
    track.input.set(input);
    if (const auto writer = assetWriter()) writer->addInput(input);
}

}  // namespace kelvo
