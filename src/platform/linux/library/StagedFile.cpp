#include "platform/linux/library/StagedFile.h"

#include <cerrno>
#include <fcntl.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <sys/sendfile.h>
#include <sys/stat.h>
#include <unistd.h>

namespace kelvo {
namespace {

constexpr std::size_t kPiece = 8U << 20;

UniqueFd create(const std::string& path) {
    return UniqueFd(::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, S_IRUSR | S_IWUSR));
}

/// Makes `path` another name of the very file that is open.
bool link(const UniqueFd& source, const std::string& path) {
    const std::string open = "/proc/self/fd/" + std::to_string(source.get());
    return ::linkat(AT_FDCWD, open.c_str(), AT_FDCWD, path.c_str(), AT_SYMLINK_FOLLOW) == 0;
}

/// One piece from the position in `source` on, by whichever call the two volumes support.
ssize_t copyPiece(const UniqueFd& source, off_t& offset, const UniqueFd& target, bool& isPlain) {
    if (!isPlain) {
        const ssize_t count = ::copy_file_range(source.get(), &offset, target.get(), nullptr, kPiece, 0);
        if (count > 0 || (count < 0 && (errno == ENOSPC || errno == EDQUOT || errno == EIO))) return count;
        isPlain = true;  // also at the end, which some file systems claim too early
    }
    return ::sendfile(target.get(), source.get(), &offset, kPiece);
}

/// Returns the errno value, 0 on success.
int copyContent(const UniqueFd& source, const UniqueFd& target) {
    off_t offset = 0;
    bool isPlain = false;
    for (;;) {
        const ssize_t count = copyPiece(source, offset, target, isPlain);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) return errno;
        if (count == 0) return 0;
    }
}

int sync(const UniqueFd& file) {
    return ::fsync(file.get()) == 0 ? 0 : errno;
}

}  // namespace

OptionalError stageFile(const UniqueFd& source, const std::string& hostPath) {
    UniqueFd target = create(hostPath);
    if (!target) return KVError::posix(errno, hostPath);
    int code = 0;
    if (::ioctl(target.get(), FICLONE, source.get()) == 0) {
        code = sync(target);
    } else if (::unlink(hostPath.c_str()) == 0 && link(source, hostPath)) {
        code = sync(source);
    } else {
        target = create(hostPath);
        if (!target) return KVError::posix(errno, hostPath);
        code = copyContent(source, target);
        if (code == 0) code = sync(target);
    }
    if (code == 0) return std::nullopt;
    ::unlink(hostPath.c_str());
    return KVError::posix(code, hostPath);
}

}  // namespace kelvo
