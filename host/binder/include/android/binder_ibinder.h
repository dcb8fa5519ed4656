#pragma once

// Binder objects, weak references and death notifications of the host binder
// emulation, under the platform header's names and signatures.
//
// Every binder of the emulation lives in this process and wraps one local
// object; nothing is marshalled. A binder stays alive until a test harness
// kills it (see binder_host/host.h).

#include <stdint.h>

#include <android/binder_status.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef uint32_t transaction_code_t;
enum {
  FIRST_CALL_TRANSACTION = 0x00000001,
  LAST_CALL_TRANSACTION = 0x00ffffff,
};

// Reference counted: AIBinder_incStrong / AIBinder_decStrong, or
// ndk::SpAIBinder. Counting is thread-safe.
struct AIBinder;
typedef struct AIBinder AIBinder;

void AIBinder_incStrong(AIBinder* binder);
void AIBinder_decStrong(AIBinder* binder);
// The number of strong references, for tests; -1 for null.
int32_t AIBinder_debugGetRefCount(AIBinder* binder);
// Always false: every binder of the emulation is in this process.
bool AIBinder_isRemote(const AIBinder* binder);
// False once the binder has been killed.
bool AIBinder_isAlive(const AIBinder* binder);
// STATUS_OK while alive, STATUS_DEAD_OBJECT afterwards.
binder_status_t AIBinder_ping(AIBinder* binder);
// Has the object behind |binder| write its diagnostic dump to |fd| (what
// dumpsys asks for), on the service thread like any call. STATUS_DEAD_OBJECT
// once the binder is killed; otherwise what the object's dump() returned.
binder_status_t AIBinder_dump(AIBinder* binder, int fd, const char** args, uint32_t num_args);

// A reference that does not keep the binder's object alive.
struct AIBinder_Weak;
typedef struct AIBinder_Weak AIBinder_Weak;

BINDER_HOST_MUST_USE_RESULT AIBinder_Weak* AIBinder_Weak_new(AIBinder* binder);
void AIBinder_Weak_delete(AIBinder_Weak* weak_binder);
// A new strong reference, or null once the last strong reference is gone.
BINDER_HOST_MUST_USE_RESULT AIBinder* AIBinder_Weak_promote(AIBinder_Weak* weak_binder);

// Death notifications. The callback runs on the thread that handles polled
// commands, once per link, unless the link is removed first.
typedef void (*AIBinder_DeathRecipient_onBinderDied)(void* cookie);
struct AIBinder_DeathRecipient;
typedef struct AIBinder_DeathRecipient AIBinder_DeathRecipient;

BINDER_HOST_MUST_USE_RESULT AIBinder_DeathRecipient* AIBinder_DeathRecipient_new(
    AIBinder_DeathRecipient_onBinderDied on_died);
// Also removes every link made with the recipient, including a notification
// that is queued but not yet delivered.
void AIBinder_DeathRecipient_delete(AIBinder_DeathRecipient* recipient);
// STATUS_UNEXPECTED_NULL for a null binder or recipient, STATUS_DEAD_OBJECT
// when the binder is already dead.
binder_status_t AIBinder_linkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient,
                                     void* cookie);
// STATUS_NAME_NOT_FOUND when no such link exists.
binder_status_t AIBinder_unlinkToDeath(AIBinder* binder, AIBinder_DeathRecipient* recipient,
                                       void* cookie);

#ifdef __cplusplus
}  // extern "C"
#endif
