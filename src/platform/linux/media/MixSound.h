#pragma once

#include "platform/linux/media/AudioAligner.h"
#include "platform/linux/media/AudioEncoder.h"
#include "platform/linux/media/AudioMixBus.h"
#include "platform/linux/media/Decoder.h"
#include "platform/linux/media/ExportParts.h"

#include <deque>
#include <memory>
#include <vector>

namespace kelvo {

/// The sound's way through a mix: decoded, brought to one clock, added up and encoded. Caller's thread.
class MixSound {
  public:
    /// For those streams of the source, at least one.
    static Result<std::unique_ptr<MixSound>> open(const ExportSource& source, const std::vector<int>& streams,
                                                  AudioEncoder::SampleHandler handler);

    /// What the movie's header says about the track.
    TrackFormat trackFormat() const { return encoder_->trackFormat(); }

    /// Takes a packet of any stream; those that are not of the mix are left alone.
    OptionalError take(const AVPacket& packet);
    /// Hands over everything that is still inside. Nothing is taken any more.
    OptionalError flush();

  private:
    struct Track {
        int stream = 0;
        Decoder decoder;
        AudioAligner aligner;
    };

    MixSound(const ExportSource& source, std::unique_ptr<AudioEncoder> encoder, std::size_t trackCount);

    OptionalError addTrack(int stream);
    OptionalError decode(Track& track, const AVPacket* packet);
    OptionalError add(Track& track, const AVFrame& frame);

    const ExportSource& source_;
    const std::unique_ptr<AudioEncoder> encoder_;
    AudioMixBus bus_;
    std::deque<Track> tracks_;
};

}  // namespace kelvo
