#include "platform/frame_channel.h"

#include <poll.h>
#include <sys/socket.h>
#include <time.h>

#include <cerrno>
#include <cstdint>

namespace qr {
namespace {

int64_t nowMs() {
  timespec t;
  ::clock_gettime(CLOCK_MONOTONIC, &t);
  return int64_t(t.tv_sec) * 1000 + t.tv_nsec / 1000000;
}

// Fills buffer completely; the deadline is absolute, negative for none.
FrameResult receiveExactly(int fd, char* buffer, size_t size, int64_t deadline) {
  while (size > 0) {
    ssize_t n = ::recv(fd, buffer, size, MSG_DONTWAIT);
    if (n > 0) {
      buffer += n;
      size -= size_t(n);
      continue;
    }
    if (n == 0) return FrameResult::Closed;
    if (errno == EINTR) continue;
    if (errno != EAGAIN && errno != EWOULDBLOCK) return FrameResult::Closed;
    int wait = -1;
    if (deadline >= 0) {
      int64_t left = deadline - nowMs();
      if (left <= 0) return FrameResult::TimedOut;
      wait = static_cast<int>(left);
    }
    pollfd p{fd, POLLIN, 0};
    int ready = ::poll(&p, 1, wait);
    if (ready == 0) return FrameResult::TimedOut;
    if (ready < 0 && errno != EINTR) return FrameResult::Closed;
  }
  return FrameResult::Received;
}

}  // namespace

bool sendFrame(int fd, std::string_view payload) {
  if (payload.size() > UINT32_MAX) return false;
  auto size = static_cast<uint32_t>(payload.size());
  std::string frame;
  frame.reserve(payload.size() + 4);
  for (int shift = 24; shift >= 0; shift -= 8) frame += static_cast<char>((size >> shift) & 0xFF);
  frame.append(payload);
  const char* p = frame.data();
  size_t left = frame.size();
  while (left > 0) {
    ssize_t n = ::send(fd, p, left, MSG_NOSIGNAL);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return false;
    p += n;
    left -= size_t(n);
  }
  return true;
}

FrameResult receiveFrame(int fd, std::string& payload, size_t maxSize, int timeoutMs) {
  int64_t deadline = timeoutMs < 0 ? -1 : nowMs() + timeoutMs;
  unsigned char header[4];
  FrameResult result = receiveExactly(fd, reinterpret_cast<char*>(header), 4, deadline);
  if (result != FrameResult::Received) return result;
  size_t size =
      (size_t(header[0]) << 24) | (size_t(header[1]) << 16) | (size_t(header[2]) << 8) | header[3];
  if (size > maxSize) return FrameResult::TooLarge;
  payload.resize(size);
  return receiveExactly(fd, payload.data(), size, deadline);
}

}  // namespace qr
