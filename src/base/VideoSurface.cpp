#include "base/VideoSurface.h"

#include <cerrno>
#include <fcntl.h>
#include <string>
#include <sys/mman.h>
#include <sys/stat.h>
#include <typeinfo>

namespace kelvo {
namespace {

constexpr std::uint32_t kLargestSide = 16384;

KVError systemError(const char* what) {
    return KVError::posix(errno, what);
}

/// Whether `descriptor` is a regular file of at least `byteCount` bytes that can no longer shrink under a
/// reader.
OptionalError checkForeignFile(int descriptor, std::size_t byteCount) {
    struct stat status {};
    if (::fstat(descriptor, &status) != 0) return systemError("surface descriptor");
    if (!S_ISREG(status.st_mode)) return KVError::posix(EINVAL, "surface descriptor is not a memory file");
    if (static_cast<std::uint64_t>(status.st_size) < byteCount) {
        return KVError::posix(EINVAL, "surface is smaller than it claims");
    }
    const int seals = ::fcntl(descriptor, F_GET_SEALS);
    if (seals < 0 || (seals & F_SEAL_SHRINK) == 0) return KVError::posix(EINVAL, "surface may shrink");
    return std::nullopt;
}

}  // namespace

bool VideoSurface::Geometry::isValid() const {
    return width >= 1 && width <= kLargestSide && height >= 1 && height <= kLargestSide &&
           bytesPerRow >= width * 4 && bytesPerRow <= kLargestSide * 8 && pixelFormat == PixelFormat::BGRx;
}

VideoSurface::VideoSurface(UniqueFd descriptor, const Geometry& geometry, std::byte* pixels, bool isWritable)
    : descriptor_(std::move(descriptor)),
      geometry_(geometry),
      file_(fileOf(descriptor_.get()).value_or(File())),
      pixels_(pixels),
      isWritable_(isWritable) {}

std::optional<VideoSurface::File> VideoSurface::fileOf(int descriptor) {
    struct stat status {};
    if (::fstat(descriptor, &status) != 0) return std::nullopt;
    return File{status.st_dev, status.st_ino};
}

VideoSurface::~VideoSurface() {
    ::munmap(pixels_, geometry_.byteCount());
}

Result<VideoSurfaceRef> VideoSurface::create(const Geometry& geometry) {
    if (!geometry.isValid()) return KVError::posix(EINVAL, "surface geometry");
    UniqueFd descriptor(::memfd_create("kelvo-surface", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    if (!descriptor) return systemError("surface memory file");
    if (::ftruncate(descriptor.get(), static_cast<off_t>(geometry.byteCount())) != 0)
        return systemError("surface size");
    if (::fcntl(descriptor.get(), F_ADD_SEALS, F_SEAL_SHRINK | F_SEAL_GROW) != 0)
        return systemError("surface seals");
    return map(std::move(descriptor), geometry, true);
}

Result<VideoSurfaceRef> VideoSurface::fromDescriptor(UniqueFd descriptor, const Geometry& geometry) {
    if (!geometry.isValid()) return KVError::posix(EINVAL, "surface geometry");
    if (auto error = checkForeignFile(descriptor.get(), geometry.byteCount())) return *error;
    return map(std::move(descriptor), geometry, false);
}

VideoSurfaceRef VideoSurface::fromHandle(const std::shared_ptr<ObjectHandle>& handle) {
    if (!handle) return nullptr;
    const ObjectHandle& object = *handle;
    return typeid(object) == typeid(VideoSurface) ? std::static_pointer_cast<VideoSurface>(handle) : nullptr;
}

Result<VideoSurfaceRef> VideoSurface::map(UniqueFd descriptor, const Geometry& geometry, bool isWritable) {
    const int protection = isWritable ? PROT_READ | PROT_WRITE : PROT_READ;
    void* address = ::mmap(nullptr, geometry.byteCount(), protection, MAP_SHARED, descriptor.get(), 0);
    if (address == MAP_FAILED) return systemError("surface mapping");
    // The constructor is private, so that a surface is always shared.
    return VideoSurfaceRef(
        new VideoSurface(std::move(descriptor), geometry, static_cast<std::byte*>(address), isWritable));
}

OptionalError VideoSurface::seal() {
    if (::fcntl(descriptor_.get(), F_ADD_SEALS, F_SEAL_FUTURE_WRITE | F_SEAL_SEAL) != 0)
        return systemError("surface seals");
    const std::string path = "/proc/self/fd/" + std::to_string(descriptor_.get());
    UniqueFd readOnly(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
    if (!readOnly) return systemError("read-only surface descriptor");
    descriptor_ = std::move(readOnly);
    keepsOutNewWriters_ = true;
    return std::nullopt;
}

void VideoSurface::keepOutNewWriters() {
    if (keepsOutNewWriters_.exchange(true)) return;
    // Refused only when it is so already.
    ::fcntl(descriptor_.get(), F_ADD_SEALS, F_SEAL_FUTURE_WRITE);
}

std::span<std::byte> VideoSurface::writablePixels() const {
    if (!isWritable_) return {};
    return {pixels_, geometry_.byteCount()};
}

}  // namespace kelvo
