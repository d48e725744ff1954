#pragma once

#include <string>
#include <string_view>

namespace kelvo {

/// A resource's address. File URLs keep the path as it was given, doubled slashes included.
class URL {
  public:
    URL() = default;
    explicit URL(std::string absoluteString) : absoluteString_(std::move(absoluteString)) {}

    /// The file URL of an absolute path; bytes that a URL may not hold are percent-encoded.
    static URL file(std::string_view path);

    const std::string& absoluteString() const { return absoluteString_; }
    bool isFileURL() const;

    /// The decoded path of a file URL; empty for any other URL.
    std::string path() const;

    friend bool operator==(const URL&, const URL&) = default;

  private:
    std::string absoluteString_;
};

}  // namespace kelvo
