#include "tools/kelvoctl/MovieOutput.h"

#include <cerrno>
#include <filesystem>
#include <unistd.h>

namespace kelvo::ctl {
namespace {

namespace fs = std::filesystem;

constexpr std::string_view kSocketUnderRoot = "/run/kelvod/com.quillon.kelvod";

std::string hostPathOf(const URL& movie, const std::string& socket) {
    std::string path = movie.path();
    std::error_code ignored;
    if (fs::exists(path, ignored) || !socket.ends_with(kSocketUnderRoot)) return path;
    return socket.substr(0, socket.size() - kSocketUnderRoot.size()) + path;
}

OptionalError failure(const std::error_code& code, const std::string& path) {
    return code ? OptionalError(KVError::posix(code.value(), path)) : std::nullopt;
}

}  // namespace

OptionalError checkOutput(const std::string& output) {
    std::error_code ignored;
    if (fs::symlink_status(output, ignored).type() != fs::file_type::not_found)
        return KVError::posix(EEXIST, output);
    const std::string folder = fs::absolute(output, ignored).parent_path().string();
    return ::access(folder.c_str(), W_OK | X_OK) == 0 ? OptionalError() : KVError::posix(errno, folder);
}

OptionalError takeMovie(const URL& movie, const std::string& socket, const std::string& output) {
    const std::string path = hostPathOf(movie, socket);
    std::error_code code;
    fs::rename(path, output, code);
    if (code != std::errc::cross_device_link) return failure(code, path + " or " + output);
    const std::string partial = output + ".part";
    fs::copy_file(path, partial, fs::copy_options::overwrite_existing, code);
    if (!code) fs::rename(partial, output, code);
    if (!code) return std::nullopt;
    std::error_code ignored;
    fs::remove(partial, ignored);
    return failure(code, output);
}

}  // namespace kelvo::ctl
