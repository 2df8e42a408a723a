// Load and unload of the DLL.
#include <array>
#include <cstddef>
#include <vector>

#include "api/exception_state.h"
#include "api/file_lists.h"
#include "api/registry.h"
#include "platform/hresult.h"
#include "platform/win32.h"
#include "report/report_file.h"

using rcvlink::CatchResult;
using rcvlink::FreeExceptionState;
using rcvlink::OpenLists;
using rcvlink::PrepareReport;
using rcvlink::Receivers;
using rcvlink::Trace;

namespace {

// Writes a line with the module's path and product version; nothing when a step fails. A host opens
// a report through the loaded library, so none is open yet and the line is discarded: only a
// debugger that stops here shows it.
void TraceModule(HMODULE module) {
  std::array<wchar_t, MAX_PATH> path{};
  if (GetModuleFileNameW(module, path.data(), MAX_PATH) == 0) return;
  DWORD ignored = 0;
  const DWORD size = GetFileVersionInfoSizeW(path.data(), &ignored);
  if (size == 0) return;
  std::vector<std::byte> version_data(size);
  if (!GetFileVersionInfoW(path.data(), 0, size, version_data.data())) return;
  VS_FIXEDFILEINFO* version = nullptr;
  UINT version_size = 0;
  if (!VerQueryValueW(
          version_data.data(), L"\\", reinterpret_cast<void**>(&version), &version_size)) {
    return;
  }
  Trace(L"Module is loaded [%s] [%u.%u.%u.%u]\r\n",
        path.data(),
        HIWORD(version->dwProductVersionMS),
        LOWORD(version->dwProductVersionMS),
        HIWORD(version->dwProductVersionLS),
        LOWORD(version->dwProductVersionLS));
}

void Start(HMODULE module) {
  PrepareReport();
  Receivers();
  OpenLists();
  TraceModule(module);
}

// Closes what the host left open. The report is still open, so it also has the lines of the ports
// that are closed, after "Bye!".
void End() {
  Trace(L"Bye!\r\n");
  OpenLists().Clear();
  Receivers().Clear();
}

}  // namespace

extern "C" BOOL WINAPI DllMain(HINSTANCE module, DWORD reason, void* process_ends) {
  if (reason == DLL_PROCESS_ATTACH) {
    Start(module);
  } else if (reason == DLL_PROCESS_DETACH) {
    // A line that cannot be written does not keep the rest from being freed.
    CatchResult([] {
      End();
      return S_OK;
    });
    // At the end of a process Windows frees everything. It has stopped the other threads wherever
    // they were, also in the middle of an allocation, so this step is left out.
    if (!process_ends) FreeExceptionState();
  }
  return TRUE;
}
