// One page of memory shared with a helper process through a descriptor: what
// one side writes there, the other reads even after the writer died.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>

namespace qr {

class SharedPage {
 public:
  static constexpr size_t kSize = 4096;

  // A new page, or null when the system gives none.
  static std::unique_ptr<SharedPage> create();
  // The page behind a descriptor passed down by the creator, or null.
  static std::unique_ptr<SharedPage> open(int fd);
  ~SharedPage();

  SharedPage(const SharedPage&) = delete;
  SharedPage& operator=(const SharedPage&) = delete;

  int fd() const noexcept { return fd_; }
  volatile uint8_t* bytes() const noexcept { return bytes_; }

 private:
  SharedPage(int fd, volatile uint8_t* bytes) : fd_(fd), bytes_(bytes) {}

  int fd_;
  volatile uint8_t* bytes_;
};

}  // namespace qr
