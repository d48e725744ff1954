#pragma once

#include "base/Value.h"

#include <string>
#include <string_view>
#include <sys/types.h>

namespace kelvo::dbus {

/// The server's side of the conversation that stands before the first message. The peer's identity comes from
/// the kernel; what it says about itself only has to agree.
class ServerAuthentication {
  public:
    enum class State { talking, done, failed };

    explicit ServerAuthentication(uid_t peer) : peer_(peer) {}

    /// Takes whole lines from the front of `incoming` and appends the answers to `outgoing`. What stands
    /// behind the last line of the conversation is left: it belongs to the first message.
    State take(Bytes& incoming, std::string& outgoing);

  private:
    std::string answer(std::string_view line);
    std::string answerToIdentity(std::string_view hexadecimal);

    const uid_t peer_;
    std::size_t taken_ = 0;
    bool hasBegun_ = false;
    bool isAuthenticated_ = false;
    bool awaitsData_ = false;
    bool isDone_ = false;
};

/// What a client sends at once. It need not wait for the answers, which `skipAnswers` takes away.
std::string clientGreeting(uid_t self);

/// Takes the server's two answers from the front of `incoming` once they are there.
ServerAuthentication::State skipAnswers(Bytes& incoming);

}  // namespace kelvo::dbus
