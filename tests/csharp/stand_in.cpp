// A stand-in for rcvlink.dll, with which ReceiverTest.cs runs the class Receiver under Mono on Linux: a receiver of
// either family with two files, which fails as the test tells it. It has a function of rcvlink.h for each that
// the test reaches; strings have 16 bits.
#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <string_view>
#include <thread>

namespace {

using Char = uint16_t;

constexpr int32_t kOk = 0;
constexpr int32_t kFalse = 1;
constexpr int32_t kNotImplemented = static_cast<int32_t>(0x80004001);
constexpr int32_t kInvalid = static_cast<int32_t>(0x80070057);

struct ReceiverInfo {
  uint32_t features, padding;
  Char *id, *reserved, *model;
  uint32_t protocol, variant;
};

struct FileInfo {
  uint32_t size, padding;
  Char* name;
  std::array<uint16_t, 8> time1, time2;
  uint64_t reserved;
};

struct Progress {
  void (*function)(void* context, unsigned char percent);
  void* context;
};

// COM's stream: Write is the fifth function of its table.
struct Stream {
  struct Table {
    std::array<void*, 4> others;
    int32_t (*write)(Stream*, const void* bytes, uint32_t count, uint32_t* written);
  };
  const Table* table;
};

// What the test sets and reads. The numbers are those of ReceiverTest.cs.
enum Family { kQuorin = 1, kVelmar = 2 };
enum Fault { kNone, kShort, kSilent, kDeafToAbort, kRefusing, kNoIdentity };

int family = kQuorin;
int fault = kNone;
std::atomic<bool> is_aborted = false;
bool is_first_gone = false;
int closed = 0;
int open_lists = 0;

std::recursive_mutex lock;
thread_local int locks_of_thread = 0;

constexpr uint32_t kSize = 10000;

bool TakeAbort() { return is_aborted.exchange(false); }

// As SysAllocString makes it: the length in bytes stands before the text. Mono frees it with free().
Char* MakeBstr(std::string_view text) {
  const auto bytes = static_cast<uint32_t>(text.size() * sizeof(Char));
  auto* const memory = static_cast<char*>(std::malloc(sizeof(bytes) + bytes + sizeof(Char)));
  std::memcpy(memory, &bytes, sizeof(bytes));
  auto* const copy = reinterpret_cast<Char*>(memory + sizeof(bytes));
  std::copy(text.begin(), text.end(), copy);
  copy[text.size()] = 0;
  return copy;
}

int32_t EndAborted() {
  if (family == kQuorin) return TakeAbort() ? kFalse : kOk;
  return fault == kDeafToAbort ? kOk : kFalse;  // a Velmar download leaves the abort for the next
}

}  // namespace

extern "C" {

void Arrange(int of_family, int with_fault) {
  family = of_family;
  fault = with_fault;
  is_aborted = is_first_gone = false;
  closed = 0;
}
int LocksOfThread() { return locks_of_thread; }
int Closed() { return closed; }
int OpenLists() { return open_lists; }

int32_t SearchReceiver(const Char* port, int32_t, int32_t, void*, void** receiver) {
  if (*receiver) return kInvalid;
  if (port[3] == '9') return kFalse;
  *receiver = &family;
  return kOk;
}

int32_t CloseReceiver(void*) {
  ++closed;
  return kOk;
}

int32_t LockConnection(void*, void*) {
  lock.lock();
  ++locks_of_thread;
  return kOk;
}

int32_t UnlockConnection(void*) {
  if (locks_of_thread == 0) return kOk;
  --locks_of_thread;
  lock.unlock();
  return kOk;
}

int32_t Abort(void*) {
  is_aborted = true;
  return kOk;
}

int32_t GetReceiverInfo(void* receiver, void*, ReceiverInfo* info) {
  info->id = info->model = nullptr;
  LockConnection(receiver, nullptr);
  if (TakeAbort() || fault == kNoIdentity) {
    if (family == kVelmar) UnlockConnection(receiver);
    return kFalse;
  }
  info->id = MakeBstr("ID7");
  info->model = MakeBstr("M");
  info->protocol = static_cast<uint32_t>(family);
  UnlockConnection(receiver);
  return kOk;
}

int32_t CheckConnection(void*, void*, int16_t* answer) {
  *answer = is_aborted ? 0 : -1;
  return kOk;
}

int32_t OpenFileList(void*, void** list) {
  ++open_lists;
  *list = &open_lists;
  return TakeAbort() ? kFalse : kOk;
}

int32_t GetFilesCount(void*, int32_t* count) {
  *count = is_first_gone ? 1 : 2;
  return kOk;
}

int32_t GetFileInfo(void*, int32_t index, FileInfo* file) {
  *file = {};
  file->size = kSize;
  file->name = MakeBstr(index == 0 && !is_first_gone ? "FIRST" : "SECOND");
  file->time1 = {2024, 3, 6, 9, 12, 30, 59, 7};
  return kOk;
}

int32_t CloseFileList(void*) {
  --open_lists;
  return kOk;
}

int32_t DownloadFile(void*, const Char*, Stream* stream, const Progress* progress) {
  if (family == kQuorin && TakeAbort()) return kFalse;
  constexpr uint32_t kBlock = 500;
  constexpr std::array<char, kBlock> kBytes{};
  const uint32_t size = fault == kShort ? kSize - kBlock : kSize;
  for (uint32_t sent = 0; sent < size;) {
    uint32_t written = 0;
    const int32_t result = stream->table->write(stream, kBytes.data(), kBlock, &written);
    if (result < 0) return family == kVelmar ? result : kOk;
    sent += written;
    progress->function(progress->context, static_cast<unsigned char>(sent * 100 / size));
    const bool waits = fault == kSilent || fault == kDeafToAbort;
    while (waits && !is_aborted) std::this_thread::sleep_for(std::chrono::milliseconds(1));
    if (is_aborted) return EndAborted();
  }
  return kOk;
}

int32_t DeleteFileW(void*, const Char*) {
  if (TakeAbort()) return kFalse;
  if (fault != kRefusing) is_first_gone = true;
  return kOk;
}

int32_t RenameFile(void* receiver, const Char* old_name, const Char* new_name) {
  if (family == kQuorin) return kNotImplemented;
  if (!old_name || !new_name) return kInvalid;
  return DeleteFileW(receiver, old_name);
}

}  // extern "C"
