#pragma once

#include <chrono>
#include <cstddef>

/// What one peer may cost this process, whatever it sends and however slowly it reads. A peer that passes a
/// bound loses its connection, with one log line; the others notice nothing.
namespace kelvo::ipc_bounds {

/// Bytes of one message, header included. A captured second of stereo sound in 32-bit floats is a third.
inline constexpr std::size_t kLargestMessage = std::size_t{1} << 20;
/// Bytes of one message's header fields. The longest request's are under 300.
inline constexpr std::size_t kLargestHeader = std::size_t{4} << 10;
/// Structures, arrays and variants inside one another.
inline constexpr int kDeepestNesting = 16;
/// Elements of one array, other than bytes.
inline constexpr std::size_t kMostElements = 4096;
/// Entries of one dictionary. Look-ups walk them; so many bound what a hostile one costs.
inline constexpr std::size_t kMostEntries = 512;
/// Values in one message altogether: what they cost in memory is a multiple of their bytes.
inline constexpr std::size_t kMostValues = 16384;
/// Bytes of one string.
inline constexpr std::size_t kLongestString = std::size_t{256} << 10;
/// Descriptors in one message.
inline constexpr std::size_t kMostDescriptors = 4;

/// Messages of one connection that wait for their turn, their bytes and their descriptors. The socket is not
/// read beyond them, so a sender that is too fast is slowed down, not cut off.
inline constexpr std::size_t kMostWaitingMessages = 32;
inline constexpr std::size_t kMostWaitingBytes = std::size_t{1} << 20;
inline constexpr std::size_t kMostWaitingDescriptors = 8;
/// Messages of one connection that are looked at in a row. Then everybody else has a turn.
inline constexpr std::size_t kMostMessagesATurn = 64;
/// Requests of one connection whose replies are owed.
inline constexpr std::size_t kMostOwedReplies = 256;
/// Bytes that wait for one peer to read them. Two seconds of captured sound fit many times.
inline constexpr std::size_t kMostUnsentBytes = std::size_t{4} << 20;
/// Descriptors among them: each pins the pixels of one frame.
inline constexpr std::size_t kMostUnsentDescriptors = 64;
/// Messages with surfaces of which one peer has not let go. Further ones are not sent, which cuts nobody off:
/// a client may well hold frames, it only gets no new ones meanwhile.
inline constexpr std::size_t kMostLentMessages = 16;
/// Connections of one listener, and of one process among them. Further ones are closed as they come.
inline constexpr std::size_t kMostConnections = 512;
inline constexpr std::size_t kMostConnectionsOfOneProcess = 32;

/// Bytes that a peer may spend on authentication.
inline constexpr std::size_t kLongestAuthentication = std::size_t{4} << 10;
/// How long it may take for that, and to send the rest of a message that it has begun.
inline constexpr std::chrono::seconds kPatience{10};

}  // namespace kelvo::ipc_bounds
