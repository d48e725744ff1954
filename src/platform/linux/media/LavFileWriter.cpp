#include "platform/linux/media/LavFileWriter.h"

namespace kelvo {

LavFileWriter::LavFileWriter(const URL& url, std::string path)
    : url_(url), path_(std::move(path)), queue_("com.quillon.KelvoKit.MediaFileWriter") {}

LavFileWriter::~LavFileWriter() {
    session_->takesSamples = false;
    session_->isAbandoned = true;
}

void LavFileWriter::addInput(std::shared_ptr<WriterInput> input) {
    if (hasStarted_) return;
    // Every input that reaches this writer was made by the same service.
    inputs_.with([&](auto& inputs) { inputs.push_back(std::static_pointer_cast<LavWriterInput>(input)); });
}

bool LavFileWriter::startWriting() {
    if (hasStarted_.exchange(true)) return false;
    if (const OptionalError error = openMovie()) {
        session_->fail(*error);
        return false;
    }
    auto expected = Status::unknown;
    return session_->status.compare_exchange_strong(expected, Status::writing);
}

/// Opens the encoders first: they tell what the file's header must say.
OptionalError LavFileWriter::openMovie() {
    std::vector<TrackFormat> tracks;
    for (const auto& input : inputs_.copy()) {
        auto format = input->open(session_, tracks.size());
        if (!format) return format.error();
        tracks.push_back(std::move(*format));
    }
    auto file = MovieFile::create(path_, tracks, MovieFile::Durability::synced);
    if (!file) return file.error();
    session_->muxer = std::make_unique<MovieMuxer>(
        std::move(*file), tracks, [session = session_.get()](const KVError& error) { session->fail(error); });
    return std::nullopt;
}

void LavFileWriter::startSession(const MediaTime& sourceTime) {
    if (status() != Status::writing || session_->timeline.start().isValid()) return;
    session_->timeline.begin(sourceTime);
    session_->takesSamples = sourceTime.isValid();
}

void LavFileWriter::finishWriting(std::function<void()> completion) {
    session_->takesSamples = false;
    queue_.async([self = shared_from_this(), completion = std::move(completion)] {
        if (self->status() == Status::writing) self->finish();
        completion();
    });
}

/// When the movie ends on its timeline; invalid where its samples end.
MediaTime LavFileWriter::end() const {
    if (const MediaTime end = end_.copy(); end.isValid()) return end;
    const MediaTime captureEnd = captureEnd_.copy();
    return session_->timeline.isBehindTheFrames(captureEnd) ? session_->timeline.sourceTime(captureEnd)
                                                            : MediaTime::invalid();
}

void LavFileWriter::finish() {
    for (const auto& input : inputs_.copy())
        input->flush();
    const MediaTime duration = end() - session_->timeline.start();
    if (const OptionalError error = session_->muxer->finish(duration)) session_->fail(*error);
    auto expected = Status::writing;
    session_->status.compare_exchange_strong(expected, Status::completed);
}

}  // namespace kelvo
