#define LOG_TAG "libbinder_ndk"

#include <android/binder_status.h>

#include <stdlib.h>
#include <string.h>

#include <string>

#include <android-base/logging.h>

// The three parts of a call's outcome. |detail| is the service-specific
// error under EX_SERVICE_SPECIFIC, the transport status under
// EX_TRANSACTION_FAILED, and 0 otherwise.
struct AStatus {
  binder_exception_t exception;
  int32_t detail;
  std::string message;
};

namespace {

AStatus* Make(binder_exception_t exception, int32_t detail, const char* message) {
  return new AStatus{exception, detail, message != nullptr ? message : ""};
}

// Not a transport status of its own, but a name the platform prints.
constexpr binder_exception_t kExHasReplyHeader = -128;

// The device reads through the pointer and crashes; the host says why.
const AStatus& Deref(const AStatus* status, const char* reader) {
  if (status == nullptr) {
    LOG(FATAL) << reader << ": the status is empty (moved from, or never set)";
    abort();
  }
  return *status;
}

std::string StatusName(binder_status_t status) {
  switch (status) {
    case STATUS_OK: return "OK";
    case STATUS_UNKNOWN_ERROR: return "UNKNOWN_ERROR";
    case STATUS_NO_MEMORY: return "NO_MEMORY";
    case STATUS_INVALID_OPERATION: return "INVALID_OPERATION";
    case STATUS_BAD_VALUE: return "BAD_VALUE";
    case STATUS_BAD_TYPE: return "BAD_TYPE";
    case STATUS_NAME_NOT_FOUND: return "NAME_NOT_FOUND";
    case STATUS_PERMISSION_DENIED: return "PERMISSION_DENIED";
    case STATUS_NO_INIT: return "NO_INIT";
    case STATUS_ALREADY_EXISTS: return "ALREADY_EXISTS";
    case STATUS_DEAD_OBJECT: return "DEAD_OBJECT";
    case STATUS_FAILED_TRANSACTION: return "FAILED_TRANSACTION";
    case STATUS_BAD_INDEX: return "BAD_INDEX";
    case STATUS_NOT_ENOUGH_DATA: return "NOT_ENOUGH_DATA";
    case STATUS_WOULD_BLOCK: return "WOULD_BLOCK";
    case STATUS_TIMED_OUT: return "TIMED_OUT";
    case STATUS_UNKNOWN_TRANSACTION: return "UNKNOWN_TRANSACTION";
    case STATUS_FDS_NOT_ALLOWED: return "FDS_NOT_ALLOWED";
    case STATUS_UNEXPECTED_NULL: return "UNEXPECTED_NULL";
    default: return std::to_string(status) + " (" + strerror(-status) + ")";
  }
}

const char* ExceptionName(binder_exception_t exception) {
  switch (exception) {
    case EX_NONE: return "EX_NONE";
    case EX_SECURITY: return "EX_SECURITY";
    case EX_BAD_PARCELABLE: return "EX_BAD_PARCELABLE";
    case EX_ILLEGAL_ARGUMENT: return "EX_ILLEGAL_ARGUMENT";
    case EX_NULL_POINTER: return "EX_NULL_POINTER";
    case EX_ILLEGAL_STATE: return "EX_ILLEGAL_STATE";
    case EX_NETWORK_MAIN_THREAD: return "EX_NETWORK_MAIN_THREAD";
    case EX_UNSUPPORTED_OPERATION: return "EX_UNSUPPORTED_OPERATION";
    case EX_SERVICE_SPECIFIC: return "EX_SERVICE_SPECIFIC";
    case EX_PARCELABLE: return "EX_PARCELABLE";
    case kExHasReplyHeader: return "EX_HAS_REPLY_HEADER";
    case EX_TRANSACTION_FAILED: return "EX_TRANSACTION_FAILED";
    default: return nullptr;
  }
}

}  // namespace

extern "C" {

AStatus* AStatus_newOk(void) { return Make(EX_NONE, 0, nullptr); }

AStatus* AStatus_fromExceptionCode(binder_exception_t exception) {
  return AStatus_fromExceptionCodeWithMessage(exception, nullptr);
}

AStatus* AStatus_fromExceptionCodeWithMessage(binder_exception_t exception, const char* message) {
  const int32_t detail = exception == EX_TRANSACTION_FAILED ? STATUS_FAILED_TRANSACTION : 0;
  return Make(exception, detail, message);
}

AStatus* AStatus_fromServiceSpecificError(int32_t service_specific) {
  return Make(EX_SERVICE_SPECIFIC, service_specific, nullptr);
}

AStatus* AStatus_fromServiceSpecificErrorWithMessage(int32_t service_specific,
                                                     const char* message) {
  return Make(EX_SERVICE_SPECIFIC, service_specific, message);
}

AStatus* AStatus_fromStatus(binder_status_t status) {
  if (status == STATUS_OK) return AStatus_newOk();
  return Make(EX_TRANSACTION_FAILED, status, nullptr);
}

bool AStatus_isOk(const AStatus* status) {
  return Deref(status, __func__).exception == EX_NONE;
}

binder_exception_t AStatus_getExceptionCode(const AStatus* status) {
  return Deref(status, __func__).exception;
}

int32_t AStatus_getServiceSpecificError(const AStatus* status) {
  const AStatus& s = Deref(status, __func__);
  return s.exception == EX_SERVICE_SPECIFIC ? s.detail : 0;
}

binder_status_t AStatus_getStatus(const AStatus* status) {
  const AStatus& s = Deref(status, __func__);
  return s.exception == EX_TRANSACTION_FAILED ? s.detail : STATUS_OK;
}

const char* AStatus_getMessage(const AStatus* status) {
  return Deref(status, __func__).message.c_str();
}

const char* AStatus_getDescription(const AStatus* status) {
  const AStatus& s = Deref(status, __func__);
  std::string text;
  if (s.exception == EX_NONE) {
    text = "No error";
  } else {
    const char* name = ExceptionName(s.exception);
    text = "Status(" + std::to_string(s.exception) + ", " +
           (name != nullptr ? name : std::to_string(s.exception)) + "): '";
    if (s.exception == EX_SERVICE_SPECIFIC) text += std::to_string(s.detail) + ": ";
    if (s.exception == EX_TRANSACTION_FAILED) text += StatusName(s.detail) + ": ";
    text += s.message + "'";
  }
  return strdup(text.c_str());
}

void AStatus_deleteDescription(const char* description) {
  free(const_cast<char*>(description));
}

void AStatus_delete(AStatus* status) { delete status; }

}  // extern "C"
