// Length-prefixed frames over a stream socket: four bytes of length, big
// endian, then the payload. The receiving side bounds both the size and the
// time it waits, so a peer that sends garbage or nothing cannot stall it.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace qr {

enum class FrameResult { Received, Closed, TimedOut, TooLarge };

// False when the peer is gone. Never raises SIGPIPE.
bool sendFrame(int fd, std::string_view payload);

// Reads frames from one socket, as many bytes at a time as have arrived, so
// that a frame usually costs one wait and one read.
class FrameReader {
 public:
  FrameReader(int fd, size_t maxSize) : fd_(fd), maxSize_(maxSize) {}

  // Waits until timeoutMs have passed (forever when negative) for one whole frame.
  FrameResult receive(std::string& payload, int timeoutMs);

 private:
  int fd_;
  size_t maxSize_;
  std::vector<char> buffer_;
  size_t start_ = 0, end_ = 0;  // the unread bytes in buffer_
};

}  // namespace qr
