#include "platform/shared_page.h"

#include <sys/mman.h>
#include <unistd.h>

namespace qr {
namespace {

volatile uint8_t* mapPage(int fd) {
  void* p = ::mmap(nullptr, SharedPage::kSize, PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
  return p == MAP_FAILED ? nullptr : static_cast<volatile uint8_t*>(p);
}

}  // namespace

std::unique_ptr<SharedPage> SharedPage::create() {
  int fd = ::memfd_create("quarrin-shared-page", MFD_CLOEXEC);
  if (fd < 0) return nullptr;
  volatile uint8_t* bytes = ::ftruncate(fd, kSize) == 0 ? mapPage(fd) : nullptr;
  if (!bytes) {
    ::close(fd);
    return nullptr;
  }
  return std::unique_ptr<SharedPage>(new SharedPage(fd, bytes));
}

std::unique_ptr<SharedPage> SharedPage::open(int fd) {
  volatile uint8_t* bytes = mapPage(fd);
  if (!bytes) return nullptr;
  return std::unique_ptr<SharedPage>(new SharedPage(fd, bytes));
}

SharedPage::~SharedPage() {
  ::munmap(const_cast<uint8_t*>(bytes_), kSize);
  ::close(fd_);
}

}  // namespace qr
