// What the library itself costs, without a line: prints JSON. The receiver is in memory, and a clock that does not
// wait shows how long the library would have paused. The sides of a comparison take turns, so that what else the
// computer does meets both.
#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "api/registry.h"
#include "platform/text.h"
#include "quorin/block.h"
#include "quorin/block_crc.h"
#include "quorin/block_download.h"
#include "quorin/link_policy.h"
#include "report/report_file.h"
#include "tests/support/allocations.h"
#include "tests/support/block_stream.h"
#include "tests/support/content.h"
#include "tests/support/stub_receiver.h"
#include "tests/torture/session.h"

namespace {

constexpr int kTurns = 15;
wchar_t port[] = L"COM7";
wchar_t file_name[] = L"A.LOG";

double Median(std::vector<double> values) {
  std::ranges::nth_element(values, values.begin() + static_cast<ptrdiff_t>(values.size() / 2));
  return values[values.size() / 2];
}

struct Side {
  const char* name;
  int count;  // of runs in a turn
  std::function<void()> run;
  std::function<void()> begin_turn = [] {};  // these two are not measured
  std::function<void()> end_turn = [] {};
};

// Prints the nanoseconds of a run of each side, the median of all turns.
void Compare(const std::vector<Side>& sides) {
  std::vector<std::vector<double>> times(sides.size());
  for (int turn = 0; turn < kTurns; ++turn) {
    for (size_t i = 0; i < sides.size(); ++i) {
      sides[i].begin_turn();
      const auto start = std::chrono::steady_clock::now();
      for (int run = 0; run < sides[i].count; ++run) sides[i].run();
      const std::chrono::duration<double, std::nano> passed =
          std::chrono::steady_clock::now() - start;
      sides[i].end_turn();
      times[i].push_back(passed.count() / sides[i].count);
    }
  }
  for (size_t i = 0; i < sides.size(); ++i) {
    std::printf("\"%s_ns\": %.1f,\n", sides[i].name, Median(times[i]));
  }
}

// One byte a step, as most programs have it.
class ByteCrc {
 public:
  ByteCrc() {
    for (size_t byte = 0; byte < table_.size(); ++byte) {
      table_[byte] = SlowCrc(std::string(1, static_cast<char>(byte)), 0);
    }
  }
  uint16_t Of(std::string_view bytes, uint16_t crc) const {
    for (const char c : bytes) {
      const auto index = static_cast<uint8_t>((crc >> 8) ^ static_cast<uint8_t>(c));
      crc = static_cast<uint16_t>(table_[index] ^ (crc << 8));
    }
    return crc;
  }

 private:
  std::array<uint16_t, 256> table_{};
};

void CompareChecksums() {
  const std::string bytes = Content(rcvlink::kBlockHeader + rcvlink::kBlockPayload);
  const std::span<const uint8_t> span(reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size());
  const ByteCrc by_byte;
  if (rcvlink::BlockCrc(span, 1) != by_byte.Of(bytes, 1) ||
      by_byte.Of(bytes, 1) != SlowCrc(bytes, 1)) {
    std::puts("the checksums differ");
    std::exit(1);
  }
  // Each goes on from the one before, so that none can be left out.
  uint16_t eight = 0;
  uint16_t one = 0;
  uint16_t bit = 0;
  Compare({{"crc_eight_bytes", 20'000, [&] { eight = rcvlink::BlockCrc(span, eight); }},
           {"crc_byte", 20'000, [&] { one = by_byte.Of(bytes, one); }},
           {"crc_bit", 2'000, [&] { bit = SlowCrc(bytes, bit); }}});
  std::printf("\"crc_results\": %d,\n", eight + one + bit);
}

void TraceOne() {
  rcvlink::Trace(L"CSerialConnection::Connect - try speed [%u] [%s]\r\n", 115200U, port);
}

std::wstring FormatLine(const wchar_t* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  std::wstring text = rcvlink::FormatArguments(format, arguments);
  va_end(arguments);
  return text;
}

void CompareTraces() {
  Compare(
      {{"trace_closed", 20'000, TraceOne},
       {"trace_formatted",
        20'000,
        [] { FormatLine(L"CSerialConnection::Connect - try speed [%u] [%s]\r\n", 115200U, port); }},
       {"trace_open",
        2'000,
        TraceOne,
        [] { dump_hlp::CreateReportFile(L"rcvlink-bench.txt"); },
        [] { dump_hlp::CloseReportFile(); }}});
  const Allocations allocations;
  for (int i = 0; i < 100; ++i) TraceOne();
  std::printf("\"trace_closed_allocations\": %zu,\n", Allocations::Count() / 100);
}

// Hands out prepared bytes at once.
class PreparedConnection : public CIConnection {
 public:
  explicit PreparedConnection(const std::string& bytes) : bytes_(bytes) {}

  HRESULT Disconnect() override { return S_OK; }
  HRESULT Read(void* buffer, DWORD size, DWORD* bytes_read, DWORD) override {
    std::memcpy(buffer, bytes_.data() + position_, size);
    position_ += size;
    *bytes_read = size;
    return S_OK;
  }
  HRESULT Write(const void*, DWORD, DWORD) override { return S_OK; }
  HRESULT Flush() override { return S_OK; }
  void Cancel() override {}
  HRESULT GetInstanceType(EInstanceType*) override { return S_OK; }
  HRESULT GetName(BSTR*) override { return E_NOTIMPL; }
  HRESULT GetSpeed(DWORD*) override { return S_OK; }
  void SetAbortEvent(HANDLE) override {}
  HRESULT SetSpeed(DWORD) override { return S_OK; }
  void ClearCancel() override {}
  rcvlink::WaitRule ExchangeWaitRule(const rcvlink::WaitRule&) override { return {}; }

 private:
  const std::string& bytes_;
  size_t position_ = 0;
};

// Discards what it gets.
class Sink : public MemoryStream {
 public:
  HRESULT STDMETHODCALLTYPE Write(const void*, ULONG size, ULONG* written) override {
    if (written) *written = size;
    return S_OK;
  }
};

void MeasureBlock() {
  constexpr int kBlocks = 2'000;
  const std::string payload = Content(rcvlink::kBlockPayload);
  BlockStream stream;
  std::string bytes;
  for (int i = 0; i < kBlocks; ++i) bytes += stream.Data(static_cast<uint16_t>(i), payload);
  bytes += stream.Last(payload);
  Sink sink;
  std::vector<double> times;
  for (int turn = 0; turn < kTurns; ++turn) {
    PreparedConnection connection(bytes);
    rcvlink::AbortSwitch abort(&connection);
    rcvlink::SerialPolicy policy(&connection);
    rcvlink::BlockDownload download(
        &connection, abort, [](uint8_t) {}, &sink, (kBlocks + 1) * 512, policy);
    const auto start = std::chrono::steady_clock::now();
    if (download.Run() != S_OK) std::exit(1);
    const std::chrono::duration<double, std::nano> passed =
        std::chrono::steady_clock::now() - start;
    times.push_back(passed.count() / (kBlocks + 1));
  }
  std::printf("\"block_ns\": %.1f,\n", Median(times));
}

void MeasureRegistry() {
  for (const int count : {1, 100, 10'000}) {
    rcvlink::ReceiverRegistry registry;
    std::vector<void*> handles;
    std::vector<std::wstring> names;
    for (int i = 0; i < count; ++i) {
      void* handle = nullptr;
      names.push_back(L"COM" + std::to_wstring(i));
      registry.Insert(names.back().c_str(), std::make_shared<StubReceiver>(), &handle);
      handles.push_back(handle);
    }
    // Every receiver in turn, since the place of one in the table is chance.
    constexpr size_t kStride = 7919;
    size_t next = 0;
    const auto place = [&] { return (next += kStride) % handles.size(); };
    const std::string by_handle = "registry_handle_" + std::to_string(count);
    const std::string by_name = "registry_name_" + std::to_string(count);
    Compare({{by_handle.c_str(), 10'000, [&] { registry.Find(handles[place()]); }},
             {by_name.c_str(), count > 1'000 ? 20 : 1'000, [&] {
                void* handle = nullptr;
                registry.Open(names[place()].c_str(), &handle);
              }}});
  }
}

sim::FileStore ManyFiles(size_t count) {
  sim::FileStore files;
  for (size_t i = 0; i < count; ++i) {
    files.Add("LOG" + std::to_string(100'000 + i) + ".JPS", sim::Bytes(10), 1'700'000'000);
  }
  return files;
}

sim::FileStore OneFile(size_t size) {
  const std::string content = Content(size);
  sim::FileStore files;
  files.Add("A.LOG", sim::Bytes(content.begin(), content.end()), 1'700'000'000);
  return files;
}

// A receiver that was found, closed in the end.
class Found {
 public:
  Found() { devapi::SearchReceiver(port, eInstanceSerial, eProtocolAny, nullptr, &handle_); }
  Found(const Found&) = delete;
  Found& operator=(const Found&) = delete;
  ~Found() { devapi::CloseReceiver(handle_); }
  void* handle() const { return handle_; }

 private:
  void* handle_ = nullptr;
};

struct Use {
  size_t count;
  size_t bytes;
};

Use OfList(EProtocol family, size_t files) {
  torture::Bench bench({"", eInstanceSerial, family}, ManyFiles(files));
  const Found receiver;
  const Allocations allocations;
  void* list = nullptr;
  if (devapi::OpenFileList(receiver.handle(), &list) != S_OK) std::exit(1);
  const Use use{Allocations::Count(), Allocations::Bytes()};
  devapi::CloseFileList(list);
  return use;
}

void CountOfList(const char* name, EProtocol family, size_t few, size_t many) {
  const Use small = OfList(family, few);
  const Use large = OfList(family, many);
  const auto entries = static_cast<double>(many - few);
  std::printf("\"%s_entry_allocations\": %.2f, \"%s_entry_bytes\": %.0f,\n",
              name,
              static_cast<double>(large.count - small.count) / entries,
              name,
              static_cast<double>(large.bytes - small.bytes) / entries);
}

size_t OfDownload(EProtocol family, size_t size) {
  torture::Bench bench({"", eInstanceSerial, family}, OneFile(size));
  const Found receiver;
  Sink sink;
  const Allocations allocations;
  if (devapi::DownloadFile(receiver.handle(), file_name, &sink, nullptr) != S_OK) std::exit(1);
  return Allocations::Count();
}

void CountOfTransfer(const char* name, EProtocol family, size_t piece) {
  constexpr size_t kPieces = 100;
  const size_t few = OfDownload(family, piece * 10);
  const size_t many = OfDownload(family, piece * (10 + kPieces));
  std::printf("\"%s_piece_allocations\": %.2f,\n", name, static_cast<double>(many - few) / kPieces);
}

// The memory of a receiver that was found, and the most that a download of it takes besides; the pauses.
void MeasureReceiver(const char* name, EProtocol family) {
  torture::Bench bench({"", eInstanceSerial, family}, OneFile(10'000));
  ManualClock& clock = bench.clock();
  Sink sink;
  // The registry's own table is there from now on.
  { const Found receiver; }

  clock.paused = 0;
  std::optional<Found> receiver;
  {
    const Allocations search;
    receiver.emplace();
    std::printf("\"%s_receiver_bytes\": %zu, \"%s_search_pauses_ms\": %lu,\n",
                name,
                Allocations::LiveBytes(),
                name,
                clock.paused);
  }
  clock.paused = 0;
  {
    const Allocations download;
    if (devapi::DownloadFile(receiver->handle(), file_name, &sink, nullptr) != S_OK) std::exit(1);
    std::printf("\"%s_download_bytes\": %zu, \"%s_download_pauses_ms\": %lu,\n",
                name,
                Allocations::MostBytes(),
                name,
                clock.paused);
  }
  clock.paused = 0;
  void* list = nullptr;
  if (devapi::OpenFileList(receiver->handle(), &list) != S_OK) std::exit(1);
  devapi::CloseFileList(list);
  std::printf("\"%s_list_pauses_ms\": %lu,\n", name, clock.paused);
}

}  // namespace

int main() {
  std::puts("{");
  CompareChecksums();
  CompareTraces();
  MeasureBlock();
  MeasureRegistry();
  CountOfList("quorin", eProtocolQuorin, 100, 1400);
  CountOfList("velmar", eProtocolVelmar, 10, 40);
  CountOfTransfer("quorin", eProtocolQuorin, 512);
  CountOfTransfer("velmar", eProtocolVelmar, 1024);
  MeasureReceiver("quorin", eProtocolQuorin);
  MeasureReceiver("velmar", eProtocolVelmar);
  std::puts("\"done\": true}");
  return 0;
}
