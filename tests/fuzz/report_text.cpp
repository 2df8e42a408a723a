// A receiver with a report: what the device says becomes lines of it.
#include "quorin/quorin_protocol.h"
#include "tests/fuzz/quorin_script.h"
#include "tests/fuzz/velmar_script.h"
#include "tests/support/manual_clock.h"
#include "tests/support/memory_stream.h"
#include "tests/support/report_capture.h"
#include "velmar/velmar_protocol.h"

namespace {

template <typename Driver, typename Script>
void Run(fuzz::Input input) {
  auto owned = std::make_unique<ScriptedConnection>();
  owned->name = rcvlink::ToWide(input.Text());
  const Script receiver(*owned, input);
  Driver driver(std::move(owned));
  CReceiverInfo info{};
  driver.GetReceiverInfo(nullptr, &info);
  SysFreeString(info.bstrReceiverId);
  SysFreeString(info.bstrModel);
  driver.DeleteFile(L"A.LOG");
  CFileList files;
  driver.GetFiles(&files);
  MemoryStream stream;
  driver.DownloadFile(L"A.LOG", &stream, nullptr);
}

// A new one from time to time keeps the file short.
void UseReport() {
  constexpr size_t kRuns = 1000;
  static size_t runs = 0;
  static std::optional<ReportCapture> report;
  if (runs++ % kRuns == 0) report.emplace();
}

}  // namespace

void fuzz::Target(std::span<const uint8_t> bytes) {
  UseReport();
  ManualClock clock;
  Input input(bytes);
  if (input.Byte() % 2 == 0) return Run<CQuorinProtocol, QuorinScript>(input);
  Run<CVelmarProtocol, VelmarScript>(input);
}
