// Length-prefixed frames over a stream socket: four bytes of length, big
// endian, then the payload. The receiving side bounds both the size and the
// time it waits, so a peer that sends garbage or nothing cannot stall it.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace qr {

enum class FrameResult { Received, Closed, TimedOut, TooLarge };

// False when the peer is gone. Never raises SIGPIPE.
bool sendFrame(int fd, std::string_view payload);

// Waits until timeoutMs have passed (forever when negative) for one whole frame.
FrameResult receiveFrame(int fd, std::string& payload, size_t maxSize, int timeoutMs);

}  // namespace qr
