#include "platform/simulated/SimulatedMediaWriter.h"

#include "base/GlobalQueue.h"

#include <algorithm>
#include <cerrno>

namespace kelvo {
namespace {

/// What every movie file of the simulated device weighs.
constexpr std::uint64_t kMovieSize = 1000000;

}  // namespace

int SimulatedBufferQueue::enqueue(SampleBufferRef sample) {
    if (const OptionalError error = faults_->take("BufferQueue.enqueue")) {
        return static_cast<int>(error->code());
    }
    samples_.with([&](auto& samples) { samples.push_back(std::move(sample)); });
    return 0;
}

SampleBufferRef SimulatedBufferQueue::dequeue() {
    return samples_.with([](auto& samples) -> SampleBufferRef {
        if (samples.empty()) return nullptr;
        SampleBufferRef oldest = std::move(samples.front());
        samples.pop_front();
        return oldest;
    });
}

bool SimulatedBufferQueue::isEmpty() const {
    return samples_.with([](const auto& samples) { return samples.empty(); });
}

void SimulatedBufferQueue::reset() {
    samples_.set({});
}

std::vector<std::int64_t> SimulatedWriterInput::presentationValues() const {
    std::vector<std::int64_t> values;
    for (const SampleBufferRef& sample : samples())
        values.push_back(sample->presentationTime().value);
    return values;
}

bool SimulatedWriterInput::isReadyForMoreMediaData() const {
    const auto writer = writer_.copy();
    if (isBusy_ || !writer || writer->status != MediaFileWriter::Status::writing) return false;
    return readyCount_ < 0 || (readyCount_ > 0 && readyCount_-- > 0);
}

bool SimulatedWriterInput::append(const SampleBufferRef& sample) {
    const auto writer = writer_.copy();
    const bool isTaken = writer && writer->status == MediaFileWriter::Status::writing &&
                         writer->isInSession && sample->isVideo() == (type_ == MediaType::video);
    if (isTaken) samples_.with([&](auto& samples) { samples.push_back(sample); });
    return isTaken;
}

SimulatedFileWriter::SimulatedFileWriter(const URL& url, std::shared_ptr<SimulatedFileSystem> fileSystem,
                                         std::shared_ptr<SimulatedFaults> faults, FinishedMovie onFinished)
    : url_(url),
      fileSystem_(std::move(fileSystem)),
      faults_(std::move(faults)),
      onFinished_(std::move(onFinished)) {}

void SimulatedFileWriter::fail(const KVError& error) {
    error_.set(error);
    state_->status = Status::failed;
}

void SimulatedFileWriter::addInput(std::shared_ptr<WriterInput> input) {
    if (status() != Status::unknown) return;
    const auto own = std::static_pointer_cast<SimulatedWriterInput>(input);
    own->writer_.set(state_);
    inputs_.with([&](auto& inputs) { inputs.push_back(own); });
}

bool SimulatedFileWriter::startWriting() {
    auto expected = Status::unknown;
    if (!state_->status.compare_exchange_strong(expected, Status::writing)) return false;
    OptionalError error = faults_->take("MediaFileWriter.startWriting");
    if (!error && fileSystem_->itemExists(url_.path())) error = KVError::posix(EEXIST, url_.path());
    if (error) {
        fail(*error);
        return false;
    }
    fileSystem_->addFile(url_.path(), kMovieSize);
    return true;
}

void SimulatedFileWriter::startSession(const MediaTime& sourceTime) {
    sessionStart_.set(sourceTime);
    state_->isInSession = true;
}

void SimulatedFileWriter::finishWriting(std::function<void()> completion) {
    state_->isInSession = false;
    GlobalQueue::get(QueuePriority::normal)
        .async([self = shared_from_this(), completion = std::move(completion)] {
            if (const OptionalError error = self->faults_->take("MediaFileWriter.finishWriting")) {
                self->fail(*error);
            } else if (self->status() == Status::writing) {
                self->state_->status = Status::completed;
                self->onFinished_(self->url_, self->movie());
            }
            completion();
        });
}

/// The tracks are those of the inputs; the movie lasts until its session was ended or its last sample ends.
SimulatedMovie SimulatedFileWriter::movie() const {
    SimulatedMovie movie;
    MediaTime end = sessionEnd();
    for (const auto& input : inputs()) {
        movie.tracks.push_back(input->mediaType());
        if (sessionEnd().isValid()) continue;
        for (const SampleBufferRef& sample : input->samples()) {
            // Sound that was cut out has no end.
            const MediaTime begin = sample->isVideo() ? sample->presentationTime()
                                                      : timeline_.sourceTime(sample->presentationTime());
            const MediaTime sampleEnd = begin + sample->duration();
            if (!end.isValid() || compare(sampleEnd, end) > 0) end = sampleEnd;
        }
    }
    movie.duration = end - sessionStart();
    return movie;
}

}  // namespace kelvo
