#pragma once

#include "base/MediaRecords.h"
#include "base/Result.h"
#include "base/UniqueFd.h"
#include "base/Value.h"

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>

namespace kelvo {

/// The picture of one video frame in a memory file that another process can map. Pixels never travel in
/// messages: the descriptor does. Thread-safe as far as its pixels are not written while somebody reads them.
class VideoSurface final : public ObjectHandle {
  public:
    enum class PixelFormat : std::uint32_t {
        BGRx = fourCharacterCode("BGRx"),  ///< 4 bytes a pixel: blue, green, red, unused
    };

    /// The shape of the picture. Width and height are 1 to 16384 pixels; a row is at least 4 * width bytes.
    struct Geometry {
        std::uint32_t width = 0;
        std::uint32_t height = 0;
        std::uint32_t bytesPerRow = 0;
        PixelFormat pixelFormat = PixelFormat::BGRx;

        /// Rows without gaps.
        static Geometry packed(std::uint32_t width, std::uint32_t height) {
            return {width, height, width * 4};
        }
        std::size_t byteCount() const { return std::size_t{bytesPerRow} * height; }
        bool isValid() const;

        friend bool operator==(const Geometry&, const Geometry&) = default;
    };

    /// Names its memory file among all files of the machine, for as long as somebody has it open.
    struct File {
        std::uint64_t device = 0;
        std::uint64_t number = 0;

        friend bool operator==(const File&, const File&) = default;
    };

    /// The file behind a descriptor; none when there is none.
    static std::optional<File> fileOf(int descriptor);

    /// A new surface of black pixels in a memory file of its own. Fails on a bad geometry and when memory or
    /// descriptors run out.
    static Result<std::shared_ptr<VideoSurface>> create(const Geometry& geometry);

    /// A read-only view of a surface that another process made. Fails on a bad geometry and when the file
    /// behind `descriptor` is smaller than the geometry says or could still shrink.
    static Result<std::shared_ptr<VideoSurface>> fromDescriptor(UniqueFd descriptor,
                                                                const Geometry& geometry);

    /// The surface behind a handle; none when there is something else, or nothing. Done for every frame, for
    /// which a dynamic cast takes long.
    static std::shared_ptr<VideoSurface> fromHandle(const std::shared_ptr<ObjectHandle>& handle);

    ~VideoSurface() override;

    const Geometry& geometry() const { return geometry_; }
    const File& file() const { return file_; }
    std::uint32_t width() const { return geometry_.width; }
    std::uint32_t height() const { return geometry_.height; }

    std::span<const std::byte> pixels() const { return {pixels_, geometry_.byteCount()}; }
    /// The pixels to draw into; empty when the surface is somebody else's.
    std::span<std::byte> writablePixels() const;

    /// The memory file; stays owned by the surface.
    int descriptor() const { return descriptor_.get(); }

    /// From now on only the writable mappings that exist (this surface's own, a display server's) can change
    /// the pixels: whoever receives the descriptor can only read. Once, before the surface is shared.
    OptionalError seal();

    /// The same for a surface that was not sealed, as far as whoever has a writable descriptor allows it.
    /// Cheap when it was done before.
    void keepOutNewWriters();

  private:
    VideoSurface(UniqueFd descriptor, const Geometry& geometry, std::byte* pixels, bool isWritable);
    static Result<std::shared_ptr<VideoSurface>> map(UniqueFd descriptor, const Geometry& geometry,
                                                     bool isWritable);

    UniqueFd descriptor_;
    Geometry geometry_;
    File file_;
    std::byte* pixels_;
    bool isWritable_;
    std::atomic<bool> keepsOutNewWriters_{false};
};

using VideoSurfaceRef = std::shared_ptr<VideoSurface>;

}  // namespace kelvo
