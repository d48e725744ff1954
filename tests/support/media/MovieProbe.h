#pragma once

#include <string>
#include <vector>

namespace kelvo::test {

/// What the `ffmpeg` and `ffprobe` programs make of a movie file: an opinion that is not our own.

/// What a shell command prints to its standard output.
std::string outputOf(const std::string& command);

/// What the decoder complains about when it decodes the whole movie: nothing, for a good one.
std::string decodingComplaints(const std::string& path);

/// One entry of a stream ("v:0", "a:1"), as in `probeStream(path, "v:0", "profile")`.
std::string probeStream(const std::string& path, const std::string& stream, const std::string& entry);
std::string probeFormat(const std::string& path, const std::string& entry);

/// By how many degrees players turn the picture.
double rotation(const std::string& path);

/// The times in seconds at which decoded frames of a stream are shown, in order.
std::vector<double> frameTimes(const std::string& path, const std::string& stream);

/// The decoded sound of a stream from the movie's beginning on: left channel, 44100 Hz.
std::vector<float> decodedSound(const std::string& path, const std::string& stream);

/// The decoded picture that is shown at `seconds`: packed RGB, as the file's colour tags say.
std::vector<unsigned char> decodedPicture(const std::string& path, double seconds);

/// The types of a file's outermost boxes, in order, separated by blanks.
std::string boxTypes(const std::string& path);

}  // namespace kelvo::test
