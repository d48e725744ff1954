#include "platform/linux/media/ExportParts.h"
#include "platform/linux/media/MixPicture.h"
#include "platform/linux/media/MixSound.h"

#include <algorithm>

namespace kelvo {
namespace {

constexpr std::size_t kVideoTrack = 0;
constexpr std::size_t kAudioTrack = 1;

class Mix {
  public:
    Mix(const ExportSource& source, const ExportRequest& request, ExportControl& control)
        : source_(source), request_(request), control_(control) {}

    OptionalError run();

  private:
    OptionalError open();
    OptionalError openPicture();
    OptionalError openSound();
    std::vector<int> mixedStreams() const;
    OptionalError take(const AVPacket& packet);
    OptionalError flush();
    auto appendTo(std::size_t track) {
        return [this, track](const SampleTiming& timing, std::span<const std::byte> data) {
            file_.append(track, timing, data);
        };
    }

    const ExportSource& source_;
    const ExportRequest& request_;
    ExportControl& control_;
    ExportFile file_;  // before those that append to it from other threads
    std::unique_ptr<MixPicture> picture_;
    std::unique_ptr<MixSound> sound_;  ///< none when nothing is mixed
};

OptionalError Mix::run() {
    if (OptionalError error = open()) return error;
    OptionalError error = forEachPacket(
        source_, control_, file_, [] { return false; }, [this](const auto& packet) { return take(packet); });
    if (error || control_.isCancelled) return error;
    error = flush();
    return error ? error : file_.finish(source_.range.duration);
}

OptionalError Mix::open() {
    // The decoder's pixel format, which the encoder must know, stands in the stream and not in the file.
    const int result = avformat_find_stream_info(&source_.reader->context(), nullptr);
    if (result < 0) return lavError(result, kMediaErrorUnreadableMovie, "movie");
    if (OptionalError error = openPicture()) return error;
    if (OptionalError error = openSound()) return error;
    std::vector<TrackFormat> formats{picture_->trackFormat()};
    if (sound_) formats.push_back(sound_->trackFormat());
    return file_.create(request_.outputPath, formats);
}

OptionalError Mix::openPicture() {
    const double duration = source_.range.duration.seconds();
    auto picture = MixPicture::open(source_, appendTo(kVideoTrack), [this, duration](double reached) {
        control_.advanceTo(reached / duration);
    });
    if (!picture) return picture.error();
    picture_ = std::move(*picture);
    return std::nullopt;
}

std::vector<int> Mix::mixedStreams() const {
    std::vector<int> streams = source_.reader->audioStreams();
    if (!request_.mix) return streams;
    std::erase_if(streams, [this](int index) {
        const auto identifier = static_cast<std::uint32_t>(source_.reader->stream(index).id);
        const AudioMixInputParameters wanted{identifier};
        return std::ranges::count(request_.mix->inputParameters, wanted) == 0;
    });
    return streams;
}

OptionalError Mix::openSound() {
    const std::vector<int> streams = mixedStreams();
    if (streams.empty()) return std::nullopt;
    auto sound = MixSound::open(source_, streams, appendTo(kAudioTrack));
    if (!sound) return sound.error();
    sound_ = std::move(*sound);
    return std::nullopt;
}

OptionalError Mix::take(const AVPacket& packet) {
    if (packet.stream_index == source_.reader->videoStream()) return picture_->take(packet);
    return sound_ ? sound_->take(packet) : std::nullopt;
}

OptionalError Mix::flush() {
    const OptionalError error = picture_->flush();
    return error || !sound_ ? error : sound_->flush();
}

}  // namespace

OptionalError exportMix(const ExportRequest& request, ExportControl& control) {
    const auto source = ExportSource::open(request);
    return source ? Mix(*source, request, control).run() : source.error();
}

}  // namespace kelvo
