#include "values/object.h"

#include <cstdio>

namespace qr {

std::string Object::description() const {
  char buf[48];
  std::snprintf(buf, sizeof buf, "<Object %p>", static_cast<const void*>(this));
  return buf;
}

void Object::destroyInBlock() const noexcept {
  void* block = const_cast<Object*>(this);
  this->~Object();  // virtual: the whole object goes
  ::operator delete(block);
}

std::string describe(const Object* o) { return o ? o->description() : "(null)"; }

}  // namespace qr
