#include "platform/linux/sounds/SoundFile.h"

#include <cerrno>

namespace kelvo {
namespace {

constexpr std::size_t kHeaderSize = 8;
constexpr std::uint32_t kPlainSamples = 1;
constexpr std::uint32_t kBits = 16;

/// The little-endian number of `size` bytes at `offset`, which are there.
std::uint32_t numberAt(std::string_view bytes, std::size_t offset, std::size_t size) {
    std::uint32_t number = 0;
    for (std::size_t i = size; i > 0; --i)
        number = number << 8 | static_cast<unsigned char>(bytes[offset + i - 1]);
    return number;
}

KVError unusable(const std::string& reason) {
    return KVError::posix(EINVAL, reason);
}

}  // namespace

Result<SoundFile> SoundFile::parse(std::string_view bytes) {
    if (bytes.size() < 12 || !bytes.starts_with("RIFF") || bytes.substr(8, 4) != "WAVE")
        return unusable("not a WAVE file");
    SoundFile sound;
    for (bytes.remove_prefix(12); bytes.size() >= kHeaderSize;) {
        const std::string_view kind = bytes.substr(0, 4);
        const std::size_t size = numberAt(bytes, 4, 4);
        bytes.remove_prefix(kHeaderSize);
        if (size > bytes.size()) return unusable("a part of the file is missing");
        if (kind == "fmt ") {
            const bool isPlain = size >= 16 && numberAt(bytes, 0, 2) == kPlainSamples;
            if (!isPlain || numberAt(bytes, 14, 2) != kBits) return unusable("not 16-bit PCM");
            sound.rate = numberAt(bytes, 4, 4);
            const std::uint32_t channels = numberAt(bytes, 2, 2);
            sound.channels = static_cast<std::uint8_t>(channels == 1 || channels == 2 ? channels : 0);
        }
        if (kind == "data") sound.samples = bytes.substr(0, size);
        bytes.remove_prefix(std::min(size + size % 2, bytes.size()));
    }
    if (sound.channels == 0 || sound.rate < 8000 || sound.rate > 96000)
        return unusable("neither mono nor stereo at 8 to 96 kHz");
    sound.samples.resize(sound.samples.size() - sound.samples.size() % (2U * sound.channels));
    if (sound.samples.empty()) return unusable("no sound in it");
    return sound;
}

}  // namespace kelvo
