#include "MovieProbe.h"

#include <array>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <sstream>

namespace kelvo::test {
namespace {

std::string quoted(const std::string& path) {
    return "'" + path + "'";
}

std::string trimmed(std::string text) {
    while (!text.empty() && (text.back() == '\n' || text.back() == ','))
        text.pop_back();
    return text;
}

}  // namespace

std::string outputOf(const std::string& command) {
    std::string output;
    FILE* pipe = ::popen(command.c_str(), "r");
    if (pipe == nullptr) return output;
    std::array<char, 65536> buffer{};
    while (const std::size_t count = std::fread(buffer.data(), 1, buffer.size(), pipe))
        output.append(buffer.data(), count);
    ::pclose(pipe);
    return output;
}

std::string decodingComplaints(const std::string& path) {
    return outputOf("ffmpeg -nostdin -v warning -i " + quoted(path) +
                    " -map 0 -fps_mode:v passthrough -enc_time_base:v -1 -f null - 2>&1");
}

std::string probeStream(const std::string& path, const std::string& stream, const std::string& entry) {
    return trimmed(outputOf("ffprobe -v error -select_streams " + stream + " -show_entries stream=" + entry +
                            " -of csv=p=0 " + quoted(path) + " 2>&1"));
}

std::string probeFormat(const std::string& path, const std::string& entry) {
    return trimmed(outputOf("ffprobe -v error -show_entries format=" + entry + " -of csv=p=0 " +
                            quoted(path) + " 2>&1"));
}

double rotation(const std::string& path) {
    return std::strtod(outputOf("ffprobe -v error -select_streams v:0 -show_entries "
                                "stream_side_data=rotation -of csv=p=0 " +
                                quoted(path))
                           .c_str(),
                       nullptr);
}

std::vector<double> frameTimes(const std::string& path, const std::string& stream) {
    std::istringstream lines(outputOf("ffprobe -v error -select_streams " + stream +
                                      " -show_entries frame=pts_time -of csv=p=0 " + quoted(path)));
    std::vector<double> times;
    for (std::string line; std::getline(lines, line);) {
        if (!line.empty()) times.push_back(std::strtod(line.c_str(), nullptr));
    }
    return times;
}

std::vector<float> decodedSound(const std::string& path, const std::string& stream) {
    const std::string bytes =
        outputOf("ffmpeg -nostdin -v error -i " + quoted(path) + " -map 0:" + stream +
                 " -af aresample=async=0:first_pts=0,pan=mono\\|c0=c0 -ar 44100 -f f32le -");
    std::vector<float> samples(bytes.size() / sizeof(float));
    if (!samples.empty()) std::memcpy(samples.data(), bytes.data(), samples.size() * sizeof(float));
    return samples;
}

std::vector<unsigned char> decodedPicture(const std::string& path, double seconds) {
    const std::string bytes =
        outputOf("ffmpeg -nostdin -v error -noautorotate -ss " + std::to_string(seconds) + " -i " +
                 quoted(path) + " -frames:v 1 -pix_fmt rgb24 -f rawvideo -");
    return {bytes.begin(), bytes.end()};
}

std::string boxTypes(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    std::string types;
    std::array<unsigned char, 16> head{};
    while (file.read(reinterpret_cast<char*>(head.data()), 8)) {
        const auto number = [&](std::size_t from, std::size_t count) {
            std::uint64_t result = 0;
            for (std::size_t i = from; i < from + count; ++i)
                result = result << 8 | head[i];
            return result;
        };
        std::uint64_t size = number(0, 4);
        const std::uint64_t start = static_cast<std::uint64_t>(file.tellg()) - 8;
        types += (types.empty() ? "" : " ") + std::string(reinterpret_cast<char*>(head.data()) + 4, 4);
        if (size == 1 && file.read(reinterpret_cast<char*>(head.data()) + 8, 8)) size = number(8, 8);
        if (size < 8) break;
        file.seekg(static_cast<std::streamoff>(start + size));
    }
    return types;
}

}  // namespace kelvo::test
