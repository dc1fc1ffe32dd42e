#include "platform/frame_channel.h"

#include <poll.h>
#include <sys/socket.h>
#include <time.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>

namespace qr {
namespace {

constexpr size_t kHeaderSize = 4;
constexpr size_t kReadSize = 64 * 1024;

int64_t nowMs() {
  timespec t;
  ::clock_gettime(CLOCK_MONOTONIC, &t);
  return int64_t(t.tv_sec) * 1000 + t.tv_nsec / 1000000;
}

}  // namespace

bool sendFrame(int fd, std::string_view payload) {
  if (payload.size() > UINT32_MAX) return false;
  auto size = static_cast<uint32_t>(payload.size());
  std::string frame;
  frame.reserve(payload.size() + kHeaderSize);
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

FrameResult FrameReader::receive(std::string& payload, int timeoutMs) {
  const int64_t deadline = timeoutMs < 0 ? -1 : nowMs() + timeoutMs;
  for (;;) {
    size_t unread = end_ - start_;
    if (unread >= kHeaderSize) {
      auto* h = reinterpret_cast<const unsigned char*>(buffer_.data() + start_);
      size_t size = (size_t(h[0]) << 24) | (size_t(h[1]) << 16) | (size_t(h[2]) << 8) | h[3];
      if (size > maxSize_) return FrameResult::TooLarge;
      if (unread >= kHeaderSize + size) {
        payload.assign(buffer_.data() + start_ + kHeaderSize, size);
        start_ += kHeaderSize + size;
        return FrameResult::Received;
      }
    }
    // Room for more: unread bytes move to the front, and a frame larger
    // than the buffer grows it.
    if (start_ > 0) {
      std::copy(buffer_.begin() + start_, buffer_.begin() + end_, buffer_.begin());
      end_ -= start_;
      start_ = 0;
    }
    if (buffer_.size() - end_ < kReadSize)
      buffer_.resize(std::max(2 * buffer_.size(), end_ + kReadSize));
    if (deadline >= 0) {
      int64_t left = deadline - nowMs();
      if (left <= 0) return FrameResult::TimedOut;
      pollfd p{fd_, POLLIN, 0};
      int ready = ::poll(&p, 1, static_cast<int>(left));
      if (ready == 0) return FrameResult::TimedOut;
      if (ready < 0) {
        if (errno == EINTR) continue;
        return FrameResult::Closed;
      }
    }
    ssize_t n = ::recv(fd_, buffer_.data() + end_, buffer_.size() - end_, 0);
    if (n == 0) return FrameResult::Closed;
    if (n < 0) {
      if (errno == EINTR) continue;
      return FrameResult::Closed;
    }
    end_ += size_t(n);
  }
}

}  // namespace qr
