#pragma once

// Binder status objects of the host binder emulation. Names, values and
// signatures are those of the platform header of the same name, so that code
// written against the platform compiles unchanged on the host.

#include <errno.h>
#include <stdbool.h>
#include <stdint.h>

// The platform marks the results below that must not be dropped with
// __attribute__((warn_unused_result)). The host says the same with the
// standard attribute, which lets a (void) cast mark a result as dropped on
// purpose under every compiler, as the platform's compiler allows.
#ifdef __cplusplus
#define BINDER_HOST_MUST_USE_RESULT [[nodiscard]]
#else
#define BINDER_HOST_MUST_USE_RESULT __attribute__((warn_unused_result))
#endif

#ifdef __cplusplus
extern "C" {
#endif

// Transport-level status codes (negative errno values, plus a few codes at
// the bottom of the 32-bit range).
enum {
  STATUS_OK = 0,
  STATUS_UNKNOWN_ERROR = (-2147483647 - 1),
  STATUS_NO_MEMORY = -ENOMEM,
  STATUS_INVALID_OPERATION = -ENOSYS,
  STATUS_BAD_VALUE = -EINVAL,
  STATUS_BAD_TYPE = (STATUS_UNKNOWN_ERROR + 1),
  STATUS_NAME_NOT_FOUND = -ENOENT,
  STATUS_PERMISSION_DENIED = -EPERM,
  STATUS_NO_INIT = -ENODEV,
  STATUS_ALREADY_EXISTS = -EEXIST,
  STATUS_DEAD_OBJECT = -EPIPE,
  STATUS_FAILED_TRANSACTION = (STATUS_UNKNOWN_ERROR + 2),
  STATUS_BAD_INDEX = -EOVERFLOW,
  STATUS_NOT_ENOUGH_DATA = -ENODATA,
  STATUS_WOULD_BLOCK = -EWOULDBLOCK,
  STATUS_TIMED_OUT = -ETIMEDOUT,
  STATUS_UNKNOWN_TRANSACTION = -EBADMSG,
  STATUS_FDS_NOT_ALLOWED = (STATUS_UNKNOWN_ERROR + 7),
  STATUS_UNEXPECTED_NULL = (STATUS_UNKNOWN_ERROR + 8),
};
typedef int32_t binder_status_t;

// Exception codes that a remote call reports to its caller.
enum {
  EX_NONE = 0,
  EX_SECURITY = -1,
  EX_BAD_PARCELABLE = -2,
  EX_ILLEGAL_ARGUMENT = -3,
  EX_NULL_POINTER = -4,
  EX_ILLEGAL_STATE = -5,
  EX_NETWORK_MAIN_THREAD = -6,
  EX_UNSUPPORTED_OPERATION = -7,
  EX_SERVICE_SPECIFIC = -8,
  EX_PARCELABLE = -9,
  EX_TRANSACTION_FAILED = -129,
};
typedef int32_t binder_exception_t;

// The outcome of one call: an exception code, the service-specific error or
// transport status that goes with it, and a message. Immutable once made; a
// status may be read from any thread, and is owned by whoever holds it.
struct AStatus;
typedef struct AStatus AStatus;

BINDER_HOST_MUST_USE_RESULT AStatus* AStatus_newOk(void);
// EX_NONE gives an OK status; EX_TRANSACTION_FAILED carries
// STATUS_FAILED_TRANSACTION; EX_SERVICE_SPECIFIC carries the error 0.
BINDER_HOST_MUST_USE_RESULT AStatus* AStatus_fromExceptionCode(binder_exception_t exception);
BINDER_HOST_MUST_USE_RESULT AStatus* AStatus_fromExceptionCodeWithMessage(
    binder_exception_t exception, const char* message);
BINDER_HOST_MUST_USE_RESULT AStatus* AStatus_fromServiceSpecificError(int32_t service_specific);
BINDER_HOST_MUST_USE_RESULT AStatus* AStatus_fromServiceSpecificErrorWithMessage(
    int32_t service_specific, const char* message);
// STATUS_OK gives an OK status; anything else is EX_TRANSACTION_FAILED.
BINDER_HOST_MUST_USE_RESULT AStatus* AStatus_fromStatus(binder_status_t status);

// The readers below take a status that exists: a null status aborts, as
// it crashes on the device.
bool AStatus_isOk(const AStatus* status);
binder_exception_t AStatus_getExceptionCode(const AStatus* status);
// 0 unless the exception is EX_SERVICE_SPECIFIC.
int32_t AStatus_getServiceSpecificError(const AStatus* status);
// STATUS_OK unless the exception is EX_TRANSACTION_FAILED.
binder_status_t AStatus_getStatus(const AStatus* status);
// Never null; empty when the status carries no message. Valid while the
// status lives.
const char* AStatus_getMessage(const AStatus* status);
// The platform's summary: "No error", or "Status(<code>, <name>): '" then
// "<error>: " for a service-specific error, "<STATUS name>: " for a failed
// transaction, then the message and "'". Release it with
// AStatus_deleteDescription.
BINDER_HOST_MUST_USE_RESULT const char* AStatus_getDescription(const AStatus* status);
void AStatus_deleteDescription(const char* description);
void AStatus_delete(AStatus* status);

#ifdef __cplusplus
}  // extern "C"
#endif
