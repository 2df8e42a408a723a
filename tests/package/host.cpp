// A host that calls each function of the library and prints what it gives:
//   package_host PORT NAME
// It is built for GNU's and for Microsoft's ABI, and both must print the same. Microsoft's C++ runtime
// is not at hand where the tests run, so the host does without one, and declares the functions of
// Windows that it needs.
#include "rcvlink.h"

extern "C" {
__declspec(dllimport) void __stdcall ExitProcess(unsigned int code);
__declspec(dllimport) wchar_t* __stdcall GetCommandLineW();
__declspec(dllimport) void* __stdcall GetStdHandle(unsigned long which);
__declspec(dllimport) int __stdcall WriteFile(
    void* file, const void* bytes, unsigned long size, unsigned long* written, void* overlapped);
__declspec(dllimport) void __stdcall SysFreeString(wchar_t* text);
int _fltused = 0;
}

// COM's stream, as objidl.h has it.
struct IStream {
  virtual long __stdcall QueryInterface(const void*, void**) { return kNotImplemented; }
  virtual unsigned long __stdcall AddRef() { return 1; }
  virtual unsigned long __stdcall Release() { return 1; }
  virtual long __stdcall Read(void*, unsigned long, unsigned long*) { return kNotImplemented; }
  virtual long __stdcall Write(const void*, unsigned long, unsigned long*) = 0;
  virtual long __stdcall Seek(long long, unsigned long, void*) { return kNotImplemented; }
  virtual long __stdcall SetSize(unsigned long long) { return kNotImplemented; }
  virtual long __stdcall CopyTo(IStream*, unsigned long long, void*, void*) {
    return kNotImplemented;
  }
  virtual long __stdcall Commit(unsigned long) { return kNotImplemented; }
  virtual long __stdcall Revert() { return kNotImplemented; }
  virtual long __stdcall LockRegion(unsigned long long, unsigned long long, unsigned long) {
    return kNotImplemented;
  }
  virtual long __stdcall UnlockRegion(unsigned long long, unsigned long long, unsigned long) {
    return kNotImplemented;
  }
  virtual long __stdcall Stat(void*, unsigned long) { return kNotImplemented; }
  virtual long __stdcall Clone(IStream**) { return kNotImplemented; }

  static const long kNotImplemented = static_cast<long>(0x80004001);
};

namespace {

class Line {
 public:
  Line() {}  // not zeroed: there is no memset
  Line& Text(const char* text) {
    while (*text != 0) Put(*text++);
    return *this;
  }
  // The texts of receivers are ASCII.
  Line& Text(const wchar_t* text) {
    for (text = text != nullptr ? text : L"(null)"; *text != 0; ++text) {
      Put(static_cast<char>(*text));
    }
    return *this;
  }
  Line& Number(unsigned long long number) {
    constexpr int kMostDigits = 20;
    char digits[kMostDigits];
    int count = 0;
    do {
      digits[count++] = static_cast<char>('0' + number % 10);
      number /= 10;
    } while (number != 0);
    while (count > 0) Put(digits[--count]);
    return *this;
  }
  Line& Hex(unsigned long number) {
    for (int shift = 28; shift >= 0; shift -= 4) Put("0123456789ABCDEF"[(number >> shift) & 0xF]);
    return *this;
  }
  void End() {
    Put('\n');
    constexpr unsigned long kStandardOutput = static_cast<unsigned long>(-11);
    unsigned long written = 0;
    WriteFile(GetStdHandle(kStandardOutput), text_, size_, &written, nullptr);
  }

 private:
  void Put(char character) {
    if (size_ < sizeof(text_)) text_[size_++] = character;
  }

  char text_[400];
  unsigned long size_ = 0;
};

void Show(const char* function, long result) {
  Line().Text(function).Text(" 0x").Hex(static_cast<unsigned long>(result)).End();
}

// Counts what is downloaded.
class Sum : public IStream {
 public:
  long __stdcall Write(const void* bytes, unsigned long size, unsigned long* written) override {
    const unsigned char* const first = static_cast<const unsigned char*>(bytes);
    // Adler-32
    for (unsigned long i = 0; i < size; ++i) {
      low_ = (low_ + first[i]) % kModulus;
      high_ = (high_ + low_) % kModulus;
    }
    size_ += size;
    if (written != nullptr) *written = size;
    return 0;
  }
  void Print() const {
    Line().Text("bytes ").Number(size_).Text(" sum ").Hex(high_ << 16 | low_).End();
  }

 private:
  static const unsigned long kModulus = 65521;
  unsigned long low_ = 1;
  unsigned long high_ = 0;
  unsigned long long size_ = 0;
};

void CountPercents(void* context, unsigned char percent) {
  *static_cast<unsigned char*>(context) = percent;
}

// The next word of the command line, which is cut into words on the way.
wchar_t* NextWord(wchar_t*& rest) {
  while (*rest == L' ') ++rest;
  const wchar_t end = *rest == L'"' ? *rest++ : L' ';
  wchar_t* const word = rest;
  while (*rest != 0 && *rest != end) ++rest;
  if (*rest != 0) *rest++ = 0;
  return word;
}

void ShowLayout() {
  Line().Text("CReceiverInfo ").Number(sizeof(CReceiverInfo)).End();
  Line().Text("  bstrReceiverId ").Number(offsetof(CReceiverInfo, bstrReceiverId)).End();
  Line().Text("  bstrReserved ").Number(offsetof(CReceiverInfo, bstrReserved)).End();
  Line().Text("  bstrModel ").Number(offsetof(CReceiverInfo, bstrModel)).End();
  Line().Text("  dwProtocol ").Number(offsetof(CReceiverInfo, dwProtocol)).End();
  Line().Text("  dwVariant ").Number(offsetof(CReceiverInfo, dwVariant)).End();
  Line().Text("CFileInfo ").Number(sizeof(CFileInfo)).End();
  Line().Text("  bstrName ").Number(offsetof(CFileInfo, bstrName)).End();
  Line().Text("  stTime1 ").Number(offsetof(CFileInfo, stTime1)).End();
  Line().Text("  stTime2 ").Number(offsetof(CFileInfo, stTime2)).End();
  Line().Text("  qwReserved ").Number(offsetof(CFileInfo, qwReserved)).End();
  Line().Text("CProgressCallback ").Number(sizeof(CProgressCallback)).End();
  Line().Text("  pContext ").Number(offsetof(CProgressCallback, pContext)).End();
  Line().Text("RCVLINK_SYSTEMTIME ").Number(sizeof(RCVLINK_SYSTEMTIME)).End();
}

void UseReport() {
  char narrow_name[] = "package-host.txt";
  wchar_t wide_name[] = L"package-host.txt";
  dump_hlp::CreateReportFile(narrow_name);
  dump_hlp::DumpReportString("a line of the host\r\n", nullptr);
  dump_hlp::CloseReportFile();
  dump_hlp::CreateReportFile(wide_name);
  dump_hlp::DumpReportString(L"a line of the host\r\n", nullptr);
  dump_hlp::CloseReportFile();
}

void Find(wchar_t* port) {
  wchar_t no_device[] = L"\\\\.\\rcvlink-none";
  void* receiver = nullptr;
  Show("CreateReceiverOnSerial",
       devapi::CreateReceiverOnSerial(port, eProtocolAny, nullptr, nullptr, &receiver));
  Show("CreateReceiverOnUSB",
       devapi::CreateReceiverOnUSB(no_device, eProtocolAny, nullptr, &receiver));
  Show("GetConnection", GetConnection(port, eInstanceSerial, nullptr));
  Show("SearchReceiverOnSerial", SearchReceiverOnSerial(port, eProtocolVelmar, nullptr, nullptr));
}

// The speed that the receiver has already: the host's port keeps its own.
const unsigned long kBaudRate = 9600;

void ShowFiles(void* receiver) {
  void* files = nullptr;
  long count = 0;
  CFileInfo file = {};
  Show("OpenFileList", devapi::OpenFileList(receiver, &files));
  Show("GetFilesCount", devapi::GetFilesCount(files, &count));
  Show("GetFileInfo", devapi::GetFileInfo(files, 0, &file));
  Line()
      .Number(static_cast<unsigned long long>(count))
      .Text(" files, ")
      .Text(file.bstrName)
      .Text(" ")
      .Number(file.dwSize)
      .Text(" bytes of ")
      .Number(file.stTime1.wYear)
      .End();
  SysFreeString(file.bstrName);
  Show("CloseFileList", devapi::CloseFileList(files));
}

void Use(void* receiver, wchar_t* port, wchar_t* name) {
  wchar_t other_name[] = L"other.jps";
  void* second = nullptr;
  Show("OpenReceiver", devapi::OpenReceiver(port, &second));
  Show("CloseReceiver", devapi::CloseReceiver(second));

  CReceiverInfo info = {};
  Show("GetReceiverInfo", devapi::GetReceiverInfo(receiver, nullptr, &info));
  Line().Text(info.bstrModel).Text(" ").Text(info.bstrReceiverId).End();
  Line()
      .Number(info.dwFeatures)
      .Text(" ")
      .Number(info.dwProtocol)
      .Text(" ")
      .Number(info.dwVariant)
      .End();
  SysFreeString(info.bstrModel);
  SysFreeString(info.bstrReceiverId);

  Show("LockConnection", devapi::LockConnection(receiver, nullptr));
  ShowFiles(receiver);
  Sum sum;
  unsigned char percent = 0;
  CProgressCallback progress = {CountPercents, &percent};
  Show("DownloadFile", devapi::DownloadFile(receiver, name, &sum, &progress));
  sum.Print();
  Line().Number(percent).Text(" %").End();
  const CFileInfo nothing = {};
  Show("UploadFile", devapi::UploadFile(receiver, &nothing, &sum, nullptr));
  Show("RenameFile", devapi::RenameFile(receiver, name, other_name));
  Show("DeleteFileW", devapi::DeleteFileW(receiver, name));
  Show("DCSetRcvBaudrate", devapi::DCSetRcvBaudrate(receiver, kBaudRate));
  Show("DCSetRcvParity", devapi::DCSetRcvParity(receiver, 0));
  Show("DCSetRcvRTSControl", devapi::DCSetRcvRTSControl(receiver, 1));
  Show("DCSetRcvStopbits", devapi::DCSetRcvStopbits(receiver, 1));
  Show("UnlockConnection", devapi::UnlockConnection(receiver));

  // The abort ends the check.
  short answer = -2;
  Show("Abort", devapi::Abort(receiver));
  Show("CheckConnection", devapi::CheckConnection(receiver, nullptr, &answer));
  Line().Text("answer ").Number(static_cast<unsigned long long>(answer + 2)).End();
}

}  // namespace

extern "C" void HostMain() {
  wchar_t* rest = GetCommandLineW();
  NextWord(rest);  // the program
  wchar_t* const port = NextWord(rest);
  wchar_t* const name = NextWord(rest);
  ShowLayout();
  UseReport();
  Find(port);
  void* receiver = nullptr;
  Show("SearchReceiver",
       devapi::SearchReceiver(port, eInstanceSerial, eProtocolQuorin, nullptr, &receiver));
  if (receiver != nullptr) Use(receiver, port, name);
  Show("DestroyReceiver", devapi::DestroyReceiver(port));
  ExitProcess(0);
}

#ifdef __MINGW32__
int main() { HostMain(); }
#endif
