// Session table, lifecycle and the content seal.
//
// Create/destroy run on the UI thread; slots are atomic pointers so a GL thread's sessionAt
// never reads a torn value. The table mutex serialises creates and destroys from different
// threads; it is never held while calling into other subsystems.
#include "session/session.h"

#include <atomic>
#include <cstdlib>
#include <cstring>
#include <new>

#include "crypto/wipe.h"
#include "input/rand48.h"

namespace tessel {

const std::uint8_t kSealKey[12] = {'Q', 'N', '-', 'T', 'e', 's', 's', 'e', 'l', 'a', 't', 'e'};

namespace {

std::atomic<KeyboardSession*> g_slots[kSessionSlots];
int g_lastCreatedSlot = -1;
std::mutex g_tableMutex;

char* copyText(const char* text) noexcept {
  const std::size_t n = std::strlen(text);
  char* copy = static_cast<char*>(std::malloc(n + 1));
  if (copy != nullptr) std::memcpy(copy, text, n + 1);
  return copy;
}

// Wipes a string that destroy deliberately leaves allocated (see destroyLocked).
void wipeKeptText(char* text) noexcept {
  if (text != nullptr) secureWipe(text, std::strlen(text));
}

void destroyLocked(int handle) noexcept {
  KeyboardSession* session = g_slots[handle].exchange(nullptr);
  if (session == nullptr) return;
  releaseOwnedText(session->appPlat);
  releaseOwnedText(session->encryPlat);
  releaseOwnedText(session->accepts);
  releaseOwnedText(session->sessionName);
  // eccKey, hashRandomSuffix and dictionaryFilter are not freed here: the release set of a
  // session is part of the library's documented behaviour (memory checkers name exactly these
  // three). Their contents are wiped all the same.
  wipeKeptText(session->eccKey);
  if (ContentStore* store = session->content) {
    releaseOwnedText(store->challengeCode);
    releaseOwnedText(store->kbdFactor);
    releaseOwnedText(store->algorithmCode);
    wipeKeptText(store->hashRandomSuffix);
    wipeKeptText(store->dictionaryFilter);
    secureWipe(store->plaintext, sizeof store->plaintext);
    secureWipe(store->scratch, sizeof store->scratch);
    wipeObject(store->cipherState);
    delete store;
  }
  delete session;
}

}  // namespace

int createSession(const char* name) noexcept {
  if (name == nullptr) return -1;
  std::lock_guard<std::mutex> guard(g_tableMutex);
  int freeSlot = -1;
  for (int slot = 0; slot < kSessionSlots; ++slot) {
    KeyboardSession* s = g_slots[slot].load();
    if (s == nullptr) {
      if (freeSlot < 0) freeSlot = slot;
    } else if (s->sessionName != nullptr && std::strcmp(s->sessionName, name) == 0) {
      return slot;
    }
  }
  if (freeSlot < 0) {
    freeSlot = (g_lastCreatedSlot + 1) % kSessionSlots;
    destroyLocked(freeSlot);
  }

  KeyboardSession* session = new (std::nothrow) KeyboardSession;
  if (session == nullptr) return -1;
  ContentStore* store = new (std::nothrow) ContentStore;
  session->sessionName = copyText(name);
  if (store != nullptr) store->algorithmCode = copyText("000");
  if (store == nullptr || session->sessionName == nullptr || store->algorithmCode == nullptr) {
    if (store != nullptr) std::free(store->algorithmCode);
    delete store;
    std::free(session->sessionName);
    delete session;
    return -1;
  }
  session->keyMask = drawKeyMask();
  store->randomByte = static_cast<std::uint8_t>(rand48Next());
  rc4Init(store->cipherState, kSealKey, sizeof kSealKey);
  session->content = store;
  g_lastCreatedSlot = freeSlot;
  g_slots[freeSlot].store(session);
  return freeSlot;
}

void destroySession(int handle) noexcept {
  if (handle < 0 || handle >= kSessionSlots) return;
  std::lock_guard<std::mutex> guard(g_tableMutex);
  destroyLocked(handle);
}

KeyboardSession* sessionAt(int handle) noexcept {
  if (handle < 0 || handle >= kSessionSlots) return nullptr;
  return g_slots[handle].load();
}

int lastCreatedSlot() noexcept {
  std::lock_guard<std::mutex> guard(g_tableMutex);
  return g_lastCreatedSlot;
}

void applySeal(ContentStore& store) noexcept {
  Rc4State state;
  rc4Init(state, kSealKey, sizeof kSealKey);
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
