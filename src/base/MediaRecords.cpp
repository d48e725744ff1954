#include "base/MediaRecords.h"

namespace kelvo {
namespace {

AudioFormatRecord packedPCM(double sampleRate, std::uint32_t channels, std::uint32_t bits,
                            std::uint32_t kind) {
    AudioFormatRecord format;
    format.sampleRate = sampleRate;
    format.formatIdentifier = kLinearPCMFormat;
    format.formatFlags = kind | kAudioFlagPacked;
    format.framesPerPacket = 1;
    format.channelsPerFrame = channels;
    format.bitsPerChannel = bits;
    format.bytesPerFrame = channels * bits / 8;
    format.bytesPerPacket = format.bytesPerFrame;
    return format;
}

}  // namespace

AudioFormatRecord AudioFormatRecord::signed16(double sampleRate, std::uint32_t channels) {
    return packedPCM(sampleRate, channels, 16, kAudioFlagSignedInteger);
}

AudioFormatRecord AudioFormatRecord::float32(double sampleRate, std::uint32_t channels) {
    return packedPCM(sampleRate, channels, 32, kAudioFlagFloat);
}

}  // namespace kelvo
