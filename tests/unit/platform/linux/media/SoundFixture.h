#pragma once

#include "platform/linux/media/AudioEncoder.h"

#include <cmath>
#include <cstring>
#include <numbers>
#include <random>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

using Samples = std::vector<float>;
using Packets = std::vector<Bytes>;

/// Samples a second.
constexpr std::size_t kTestRate = 44100;

inline Samples sine(std::size_t count, double hertz, double amplitude = 0.5) {
    Samples samples(count);
    for (std::size_t i = 0; i < count; ++i) {
        const double phase = 2 * std::numbers::pi * hertz * static_cast<double>(i) / kTestRate;
        samples[i] = static_cast<float>(amplitude * std::sin(phase));
    }
    return samples;
}

inline Samples noise(std::size_t count, float amplitude = 0.3F) {
    std::mt19937 random(1);
    std::uniform_real_distribution<float> level(-amplitude, amplitude);
    Samples samples(count);
    for (float& sample : samples)
        sample = level(random);
    return samples;
}

/// Bursts of a hissing sound at every quarter of a second, out of silence.
inline Samples claps(std::size_t count) {
    Samples samples = noise(count, 0.8F);
    for (std::size_t i = 0; i < count; ++i) {
        const auto sinceClap = static_cast<float>(i % (kTestRate / 4));
        samples[i] *= std::exp(-sinceClap / 300);
    }
    return samples;
}

/// Noise that swells and ebbs two hundred times a second, as a rough voice does.
inline Samples rasping(std::size_t count) {
    Samples samples = noise(count, 0.5F);
    const Samples swell = sine(count, 200);
    for (std::size_t i = 0; i < count; ++i)
        samples[i] *= 0.55F - 0.9F * swell[i];
    return samples;
}

/// What libavcodec decodes, channel by channel.
inline std::vector<Samples> decoded(const Packets& packets, std::span<const std::byte> configuration) {
    const AVCodec* codec = avcodec_find_decoder(AV_CODEC_ID_AAC);
    const CodecContextPointer context(avcodec_alloc_context3(codec));
    context->extradata =
        static_cast<std::uint8_t*>(av_mallocz(configuration.size() + AV_INPUT_BUFFER_PADDING_SIZE));
    std::memcpy(context->extradata, configuration.data(), configuration.size());
    context->extradata_size = static_cast<int>(configuration.size());
    context->err_recognition = AV_EF_EXPLODE;
    EXPECT_EQ(avcodec_open2(context.get(), codec, nullptr), 0);
    const PacketPointer packet(av_packet_alloc());
    const FramePointer frame(av_frame_alloc());
    std::vector<Samples> channels(static_cast<std::size_t>(context->ch_layout.nb_channels));
    for (const Bytes& bytes : packets) {
        EXPECT_EQ(av_new_packet(packet.get(), static_cast<int>(bytes.size())), 0);
        std::memcpy(packet->data, bytes.data(), bytes.size());
        EXPECT_EQ(avcodec_send_packet(context.get(), packet.get()), 0);
        av_packet_unref(packet.get());
        while (avcodec_receive_frame(context.get(), frame.get()) == 0) {
            for (std::size_t channel = 0; channel < channels.size(); ++channel) {
                const auto* samples = reinterpret_cast<const float*>(frame->extended_data[channel]);
                channels[channel].insert(channels[channel].end(), samples, samples + frame->nb_samples);
            }
        }
    }
    return channels;
}

/// How far apart two sounds are from one sample to another, in decibels below the first.
inline double distance(const Samples& sound, const Samples& other, std::size_t from, std::size_t to) {
    double power = 0;
    double difference = 0;
    for (std::size_t i = from; i < to; ++i) {
        power += sound[i] * sound[i];
        difference += (sound[i] - other[i]) * (sound[i] - other[i]);
    }
    return 10 * std::log10(power / std::max(difference, 1e-12));
}

}  // namespace kelvo::test
