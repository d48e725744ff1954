#pragma once

#include <cstdint>
#include <string_view>

/// The keys and values of a writer input's output settings. Dictionaries, because a broadcast extension may
/// replace compression properties by name.
namespace kelvo {

// Video settings.
inline constexpr std::string_view kVideoCodecKey = "VideoCodec";
inline constexpr std::string_view kVideoWidthKey = "VideoWidth";    ///< double: pixels, even
inline constexpr std::string_view kVideoHeightKey = "VideoHeight";  ///< double: pixels, even
inline constexpr std::string_view kVideoCompressionPropertiesKey = "VideoCompressionProperties";

/// Value of `kVideoCodecKey`.
inline constexpr std::string_view kVideoCodecH264 = "avc1";

// Compression properties. An encoder logs and ignores those that it does not know or that are of another
// type.
/// Integer: bits per second on average. Brought into the range that encoders take; 0 or less leaves the rate
/// to the encoder, at a constant quality.
inline constexpr std::string_view kAverageBitRateKey = "AverageBitRate";
/// Number: frames per second that are expected; frames may come at any other pace.
inline constexpr std::string_view kExpectedSourceFrameRateKey = "ExpectedSourceFrameRate";
/// Integer: at most this many frames from one key frame to the next.
inline constexpr std::string_view kMaxKeyFrameIntervalKey = "MaxKeyFrameInterval";
/// Number: at most this many seconds from one key frame to the next; 0 is no limit.
inline constexpr std::string_view kMaxKeyFrameIntervalDurationKey = "MaxKeyFrameIntervalDuration";
/// Text: one of the profile and level values below.
inline constexpr std::string_view kProfileLevelKey = "ProfileLevel";

// Values of `kProfileLevelKey`; the encoder chooses the level.
inline constexpr std::string_view kProfileLevelH264Baseline = "H264_Baseline_AutoLevel";
inline constexpr std::string_view kProfileLevelH264Main = "H264_Main_AutoLevel";
inline constexpr std::string_view kProfileLevelH264High = "H264_High_AutoLevel";

// Audio settings.
inline constexpr std::string_view kAudioFormatKey = "AudioFormat";              ///< a four-character code
inline constexpr std::string_view kAudioChannelCountKey = "AudioChannelCount";  ///< integer
inline constexpr std::string_view kAudioSampleRateKey = "AudioSampleRate";      ///< double: hertz
inline constexpr std::string_view kAudioChannelLayoutKey =
    "AudioChannelLayout";                                             ///< bytes of a layout record
inline constexpr std::string_view kAudioBitRateKey = "AudioBitRate";  ///< integer: bits per second

/// The layout tag of two channels, left and right.
inline constexpr std::uint32_t kStereoLayoutTag = 0x00650002;

}  // namespace kelvo
