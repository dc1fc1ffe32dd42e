// The raw calls through plug-in function tables, in one place. Callers wrap
// each in guardPluginCall; these only follow the table layouts and the
// ownership rules of the plug-in interface.
#pragma once

#include <cstdint>

#include "values/array.h"
#include "values/string.h"
#include "values/uuid.h"

namespace qr::plugin_calls {

// QueryInterface (slot 1 of the instance's table), storing straight into *out.
int32_t queryInterface(void* instance, const UUID& interfaceID, void** out);
// Release (slot 3).
void releaseInstance(void* instance);

// I/O module entry 3. The strings stay the plug-in's; the caller gets its own
// references. Values that are not strings are ignored.
int32_t getConnectionInfo(void* interface, Ref<String>* connectionType, Ref<String>* pbmPath);

// Printer module entry 3. The array handed back is the caller's; anything
// that is not an array counts as no answer.
Ref<Array> createBrowserInfo(void* interface, const String& connectionType);

}  // namespace qr::plugin_calls
