#pragma once

#include "base/Value.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>

namespace kelvo {

/// User-info key of the text that a person may be shown about an error.
inline constexpr std::string_view kLocalizedDescriptionKey = "KVLocalizedDescription";
/// User-info key of the text that tells why it failed.
inline constexpr std::string_view kLocalizedFailureReasonKey = "KVLocalizedFailureReason";
/// Domain of errors that the operating system reported; the code is the errno value.
inline constexpr std::string_view kPOSIXErrorDomain = "KVPOSIXErrorDomain";

/// An error value: domain, code and user information. "No error" is an empty optional.
class KVError {
  public:
    KVError(std::string domain, std::int64_t code, Dictionary userInfo = {});

    /// An operating-system error (`code` is an errno value) about `subject`, usually a path. Thread-safe.
    static KVError posix(int code, std::string_view subject);

    const std::string& domain() const { return domain_; }
    std::int64_t code() const { return code_; }
    const Dictionary& userInfo() const { return userInfo_; }

    /// The texts under the keys above; empty when there are none.
    std::string localizedDescription() const { return textFor(kLocalizedDescriptionKey); }
    std::string localizedFailureReason() const { return textFor(kLocalizedFailureReasonKey); }

    /// What a log line shows: domain, code and description.
    std::string description() const;

    friend bool operator==(const KVError&, const KVError&) = default;

  private:
    std::string textFor(std::string_view key) const;

    std::string domain_;
    std::int64_t code_;
    Dictionary userInfo_;
};

using OptionalError = std::optional<KVError>;

/// Completion of work that yields nothing but its failure.
using ErrorHandler = std::function<void(const OptionalError&)>;
/// Completion of work that yields a movie.
using MovieHandler = std::function<void(const std::optional<URL>& movieURL, const OptionalError&)>;

}  // namespace kelvo
