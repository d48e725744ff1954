#include "platform/linux/ipc/Authentication.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>

namespace {

using kelvo::Bytes;
using State = kelvo::dbus::ServerAuthentication::State;

struct Outcome {
    State state = State::talking;
    std::string answers;
    Bytes rest;
    friend bool operator==(const Outcome&, const Outcome&) = default;
};

/// The conversation when its bytes come in pieces of this size.
Outcome converse(std::span<const std::byte> bytes, std::size_t piece) {
    kelvo::dbus::ServerAuthentication server(1000);
    Outcome outcome;
    while (!bytes.empty() && outcome.state == State::talking) {
        const auto next = bytes.first(std::min(piece, bytes.size()));
        outcome.rest.insert(outcome.rest.end(), next.begin(), next.end());
        outcome.state = server.take(outcome.rest, outcome.answers);
        bytes = bytes.subspan(next.size());
    }
    if (outcome.state == State::done) outcome.rest.insert(outcome.rest.end(), bytes.begin(), bytes.end());
    return outcome;
}

}  // namespace

/// Any bytes are a conversation that ends the same way however they arrive.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const auto bytes = std::as_bytes(std::span(data, size));
    const Outcome whole = converse(bytes, std::max<std::size_t>(size, 1));
    const Outcome cut = converse(bytes, 7);
    // A conversation that fails may be left at different points.
    if (whole.state != State::failed && cut.state != State::failed && !(whole == cut)) std::abort();
    if (whole.state == State::done && cut.state != State::done) std::abort();
    Bytes answers(bytes.begin(), bytes.end());
    if (kelvo::dbus::skipAnswers(answers) == State::done && answers.size() > size) std::abort();
    return 0;
}
