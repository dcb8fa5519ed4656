#pragma once

// The service registry of the host binder emulation, under the platform
// header's names. Thread-safe.

#include <android/binder_ibinder.h>
#include <android/binder_status.h>

#ifdef __cplusplus
extern "C" {
#endif

// Registers |binder| under |instance|, replacing an earlier registration of
// that name; the registry keeps a strong reference. EX_ILLEGAL_ARGUMENT for
// a null binder or name.
binder_exception_t AServiceManager_addService(AIBinder* binder, const char* instance);
// A new strong reference to the registered binder, or null.
AIBinder* AServiceManager_checkService(const char* instance);
// As AServiceManager_checkService: the registry never waits.
AIBinder* AServiceManager_getService(const char* instance);

#ifdef __cplusplus
}  // extern "C"
#endif
