// Moving objects across the C interface of <quarrin/plugin.h>. A C handle is
// always the address of the qr::Object base, so every conversion goes through
// Object* and a handle of any kind can be read back with the right type test.
#pragma once

#include <quarrin/plugin.h>

#include "values/object.h"

namespace qr {

inline Object* fromC(QrTypeRef handle) noexcept {
  return const_cast<Object*>(static_cast<const Object*>(handle));
}

// The object behind a handle as T, or null for NULL or another kind.
template <class T>
T* fromCAs(QrTypeRef handle) noexcept {
  return handle ? cast<T>(fromC(handle)) : nullptr;
}

// Lends an object to C code: no reference changes hands.
template <class Handle = QrTypeRef>
Handle toC(const Object* object) noexcept {
  return reinterpret_cast<Handle>(const_cast<Object*>(object));
}

// Hands C code the reference held by r (a Create/Copy result).
template <class Handle = QrTypeRef, class T>
Handle leakToC(Ref<T> r) noexcept {
  return toC<Handle>(static_cast<Object*>(r.leak()));
}

// Takes over a reference that C code handed out (a Create/Copy result from a
// plug-in); null for NULL or another kind, releasing the reference then.
template <class T>
Ref<T> adoptFromC(QrTypeRef handle) noexcept {
  Ref<Object> owned = Ref<Object>::adopt(fromC(handle));
  return cast<T>(owned);
}

}  // namespace qr
