// Session table, lifecycle and the content seal.
//
// The table mutex serialises creates, destroys and pins; it is held only for a slot scan or a
// pointer exchange plus a counter increment, never while calling into other subsystems or
// while freeing. A session's memory is released by releasePin() when its count reaches zero.
#include "session/session.h"

#include <cstdlib>
#include <cstring>
#include <new>

#include "crypto/wipe.h"
#include "crypto/rand48.h"
#include "pattern/pattern_engine.h"

namespace tessel {

const std::uint8_t kSealKey[12] = {'Q', 'N', '-', 'T', 'e', 's', 's', 'e', 'l', 'a', 't', 'e'};

namespace {

KeyboardSession* g_slots[kSessionSlots];
int g_lastCreatedSlot = -1;
std::mutex g_tableMutex;

char* copyText(const char* text) noexcept {
  const std::size_t n = std::strlen(text);
  char* copy = static_cast<char*>(std::malloc(n + 1));
  if (copy != nullptr) std::memcpy(copy, text, n + 1);
  return copy;
}

// Wipes a string that destroy deliberately leaves allocated (see freeSession).
void wipeKeptText(char* text) noexcept {
  if (text != nullptr) secureWipe(text, std::strlen(text));
}

// Wipes and frees an unreachable session: nobody holds a pin any more.
void freeSession(KeyboardSession* session) noexcept {
  releaseOwnedText(session->appPlat);
  releaseOwnedText(session->encryPlat);
  releaseOwnedText(session->accepts);
  delete session->acceptsEngine;
  releaseOwnedText(session->sessionName);
  // eccKey, hashRandomSuffix and dictionaryFilter are not freed here: the release set of a
  // session is part of the library's documented behaviour (memory checkers name exactly these
  // three). Their contents are wiped all the same.
  wipeKeptText(session->eccKey);
  ContentStore* store = session->content;
  releaseOwnedText(store->challengeCode);
  releaseOwnedText(store->kbdFactor);
  releaseOwnedText(store->algorithmCode);
  wipeKeptText(store->hashRandomSuffix);
  wipeKeptText(store->dictionaryFilter);
  secureWipe(store->plaintext, sizeof store->plaintext);
  secureWipe(store->scratch, sizeof store->scratch);
  wipeObject(store->cipherState);
  delete store;
  delete session;
}

void releasePin(KeyboardSession* session) noexcept {
  if (session->pins.fetch_sub(1, std::memory_order_acq_rel) == 1) freeSession(session);
}

// Empties a slot under the table mutex; the caller drops the returned table pin outside it.
KeyboardSession* unlinkLocked(int slot) noexcept {
  KeyboardSession* session = g_slots[slot];
  g_slots[slot] = nullptr;
  return session;
}

// The slot holding a session named `name`, or -1. Table mutex held.
int findLocked(const char* name) noexcept {
  for (int i = 0; i < kSessionSlots; ++i)
    if (g_slots[i] != nullptr && std::strcmp(g_slots[i]->sessionName, name) == 0) return i;
  return -1;
}

}  // namespace

int createSession(const char* name) noexcept {
  if (name == nullptr) return -1;
  {
    std::lock_guard<std::mutex> guard(g_tableMutex);
    const int slot = findLocked(name);
    if (slot >= 0) return slot;  // the existing session is reused unchanged
  }

  // Allocated outside the table mutex; a create of the same name that wins the race meanwhile
  // is found again below, and this session is dropped unused.
  KeyboardSession* session = new (std::nothrow) KeyboardSession;
  ContentStore* store = new (std::nothrow) ContentStore;
  char* sessionName = copyText(name);
  char* algorithmCode = copyText("000");
  if (session == nullptr || store == nullptr || sessionName == nullptr || algorithmCode == nullptr) {
    std::free(algorithmCode);
    std::free(sessionName);
    delete store;
    delete session;
    return -1;
  }
  session->sessionName = sessionName;
  store->algorithmCode = algorithmCode;
  session->content = store;
  session->keyMask = drawKeyMask();
  store->randomByte = static_cast<std::uint8_t>(rand48Next());
  rc4Init(store->cipherState, kSealKey, sizeof kSealKey);

  KeyboardSession* dropped = nullptr;
  int slot;
  {
    std::lock_guard<std::mutex> guard(g_tableMutex);
    slot = findLocked(name);
    if (slot >= 0) {
      dropped = session;
    } else {
      for (int i = 0; i < kSessionSlots && slot < 0; ++i)
        if (g_slots[i] == nullptr) slot = i;
      if (slot < 0) {
        slot = (g_lastCreatedSlot + 1) % kSessionSlots;
        dropped = unlinkLocked(slot);
      }
      g_lastCreatedSlot = slot;
      g_slots[slot] = session;
    }
  }
  if (dropped != nullptr) releasePin(dropped);
  return slot;
}

void destroySession(int handle) noexcept {
  if (handle < 0 || handle >= kSessionSlots) return;
  KeyboardSession* session;
  {
    std::lock_guard<std::mutex> guard(g_tableMutex);
    session = unlinkLocked(handle);
  }
  if (session != nullptr) releasePin(session);
}

KeyboardSession* sessionAt(int handle) noexcept {
  if (handle < 0 || handle >= kSessionSlots) return nullptr;
  std::lock_guard<std::mutex> guard(g_tableMutex);
  return g_slots[handle];
}

SessionRef::SessionRef(int handle, Access access) noexcept {
  if (handle < 0 || handle >= kSessionSlots) return;
  {
    std::lock_guard<std::mutex> guard(g_tableMutex);
    session_ = g_slots[handle];
    if (session_ == nullptr) return;
    session_->pins.fetch_add(1, std::memory_order_relaxed);
  }
  if (access == Access::kExclusive) {
    session_->opLock.lock();
    exclusive_ = true;
  }
}

SessionRef::SessionRef(SessionRef&& other) noexcept
    : session_(other.session_), exclusive_(other.exclusive_) {
  other.session_ = nullptr;
  other.exclusive_ = false;
}

SessionRef& SessionRef::operator=(SessionRef&& other) noexcept {
  if (this != &other) {
    reset();
    session_ = other.session_;
    exclusive_ = other.exclusive_;
    other.session_ = nullptr;
    other.exclusive_ = false;
  }
  return *this;
}

void SessionRef::reset() noexcept {
  if (session_ == nullptr) return;
  if (exclusive_) session_->opLock.unlock();
  releasePin(session_);
  session_ = nullptr;
  exclusive_ = false;
}

void applySeal(ContentStore& store) noexcept {
  Rc4State state = store.cipherState;  // the seal key's schedule, made once at creation
  const std::size_t n = store.length;
  rc4Crypt(state, store.plaintext, store.plaintext, n);
  wipeObject(state);
}

ContentGuard::ContentGuard(ContentStore& store) noexcept : store_(store) {
  if (store_.length != 0) applySeal(store_);
}

ContentGuard::~ContentGuard() {
  if (store_.length != 0) applySeal(store_);
}

void clearContent(ContentStore& store) noexcept {
  store.length = 0;
  secureWipe(store.plaintext, sizeof store.plaintext);
  secureWipe(store.scratch, sizeof store.scratch);
}

int contentLength(const KeyboardSession& session) noexcept {
  return static_cast<std::int16_t>(session.content->length.load());
}

bool replaceOwnedText(char*& field, const char* text) noexcept {
  releaseOwnedText(field);
  if (text == nullptr) return true;
  field = copyText(text);
  return field != nullptr;
}

void releaseOwnedText(char*& field) noexcept {
  wipeAndFreeText(field);
  field = nullptr;
}

}  // namespace tessel
