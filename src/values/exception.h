// The platform exception: what plug-ins raise and what guarded calls catch.
// Any other C++ exception passes the guards untouched.
#pragma once

#include <stdexcept>
#include <string>

namespace qr {

class Exception : public std::exception {
 public:
  Exception(std::string name, std::string reason)
      : name_(std::move(name)), reason_(std::move(reason)), what_(name_ + ": " + reason_) {}

  const std::string& name() const noexcept { return name_; }
  const std::string& reason() const noexcept { return reason_; }
  const char* what() const noexcept override { return what_.c_str(); }

 private:
  std::string name_;
  std::string reason_;
  std::string what_;
};

}  // namespace qr
