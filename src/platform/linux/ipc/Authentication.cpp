#include "platform/linux/ipc/Authentication.h"

#include "platform/IPCBounds.h"

#include <algorithm>
#include <array>
#include <optional>

namespace kelvo::dbus {
namespace {

/// Names this server; nobody compares it, every daemon may have the same.
constexpr std::string_view kServerIdentity = "6b656c766f640000000000000000001f";
constexpr std::string_view kAccepted = "OK ";
constexpr std::string_view kDescriptorsAgreed = "AGREE_UNIX_FD";

/// The next line without its end, taken from the front; none while it is not there as a whole.
std::optional<std::string> takeLine(Bytes& incoming) {
    constexpr std::array kEnd{std::byte{'\r'}, std::byte{'\n'}};
    const auto end = std::search(incoming.begin(), incoming.end(), kEnd.begin(), kEnd.end());
    if (end == incoming.end()) return std::nullopt;
    std::string line;
    for (auto byte = incoming.begin(); byte != end; ++byte)
        line.push_back(static_cast<char>(*byte));
    incoming.erase(incoming.begin(), end + 2);
    return line;
}

std::string hexadecimalOf(uid_t user) {
    std::string text;
    for (const char digit : std::to_string(user))
        text += std::string("3") + digit;  // the ASCII code of a digit
    return text;
}

}  // namespace

ServerAuthentication::State ServerAuthentication::take(Bytes& incoming, std::string& outgoing) {
    if (!hasBegun_ && !incoming.empty()) {
        if (incoming.front() != std::byte{0}) return State::failed;
        incoming.erase(incoming.begin());
        hasBegun_ = true;
    }
    while (!isDone_) {
        const auto line = takeLine(incoming);
        if (!line) break;
        taken_ += line->size() + 2;
        const std::string reply = answer(*line);
        if (!reply.empty()) outgoing += reply + "\r\n";
        if (taken_ > ipc_bounds::kLongestAuthentication) return State::failed;
    }
    if (isDone_) return isAuthenticated_ ? State::done : State::failed;
    return incoming.size() > ipc_bounds::kLongestAuthentication ? State::failed : State::talking;
}

std::string ServerAuthentication::answer(std::string_view line) {
    if (line == "BEGIN") {
        isDone_ = true;
        return {};
    }
    if (line == "NEGOTIATE_UNIX_FD" && isAuthenticated_) return std::string(kDescriptorsAgreed);
    if (line == "AUTH EXTERNAL") {
        awaitsData_ = true;
        return "DATA";
    }
    if (line.starts_with("AUTH EXTERNAL ")) return answerToIdentity(line.substr(14));
    if (awaitsData_ && line == "DATA") return answerToIdentity("");
    if (awaitsData_ && line.starts_with("DATA ")) return answerToIdentity(line.substr(5));
    if (line.starts_with("AUTH") || line == "CANCEL" || line.starts_with("ERROR")) return "REJECTED EXTERNAL";
    return "ERROR";
}

std::string ServerAuthentication::answerToIdentity(std::string_view hexadecimal) {
    awaitsData_ = false;
    isAuthenticated_ = hexadecimal.empty() || hexadecimal == hexadecimalOf(peer_);
    return isAuthenticated_ ? std::string(kAccepted) + std::string(kServerIdentity) : "REJECTED EXTERNAL";
}

std::string clientGreeting(uid_t self) {
    return std::string(1, '\0') + "AUTH EXTERNAL " + hexadecimalOf(self) +
           "\r\nNEGOTIATE_UNIX_FD\r\nBEGIN\r\n";
}

ServerAuthentication::State skipAnswers(Bytes& incoming) {
    using State = ServerAuthentication::State;
    Bytes rest = incoming;
    const auto accepted = takeLine(rest);
    const auto agreed = accepted ? takeLine(rest) : std::nullopt;
    if (accepted && !accepted->starts_with(kAccepted)) return State::failed;
    if (agreed && *agreed != kDescriptorsAgreed) return State::failed;
    if (!agreed) return incoming.size() > ipc_bounds::kLongestAuthentication ? State::failed : State::talking;
    incoming = std::move(rest);
    return State::done;
}

}  // namespace kelvo::dbus
