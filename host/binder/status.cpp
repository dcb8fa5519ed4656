#include <android/binder_status.h>

#include <stdlib.h>
#include <string.h>

#include <string>

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

// What an empty status (a null pointer) reads as: a call that never produced
// a status did not succeed.
const AStatus kNullStatus{EX_TRANSACTION_FAILED, STATUS_UNEXPECTED_NULL, ""};

const AStatus& Deref(const AStatus* status) { return status != nullptr ? *status : kNullStatus; }

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
    case EX_HAS_REPLY_HEADER: return "EX_HAS_REPLY_HEADER";
    case EX_TRANSACTION_FAILED: return "EX_TRANSACTION_FAILED";
    default: return "UNKNOWN";
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

bool AStatus_isOk(const AStatus* status) { return Deref(status).exception == EX_NONE; }

binder_exception_t AStatus_getExceptionCode(const AStatus* status) {
  return Deref(status).exception;
}

int32_t AStatus_getServiceSpecificError(const AStatus* status) {
  const AStatus& s = Deref(status);
  return s.exception == EX_SERVICE_SPECIFIC ? s.detail : 0;
}

binder_status_t AStatus_getStatus(const AStatus* status) {
  const AStatus& s = Deref(status);
  return s.exception == EX_TRANSACTION_FAILED ? s.detail : STATUS_OK;
}

const char* AStatus_getMessage(const AStatus* status) { return Deref(status).message.c_str(); }

const char* AStatus_getDescription(const AStatus* status) {
  const AStatus& s = Deref(status);
  std::string text;
  if (s.exception == EX_NONE) {
    text = "No error";
  } else {
    text = "Status(" + std::to_string(s.exception) + ", " + ExceptionName(s.exception) + "): '";
    if (s.exception == EX_SERVICE_SPECIFIC || s.exception == EX_TRANSACTION_FAILED) {
      text += std::to_string(s.detail) + ": ";
    }
    text += s.message + "'";
  }
  return strdup(text.c_str());
}

void AStatus_deleteDescription(const char* description) {
  free(const_cast<char*>(description));
}

void AStatus_delete(AStatus* status) { delete status; }

}  // extern "C"
