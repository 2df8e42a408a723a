// The exported functions that pass a call to a receiver. The registry's lock is released before the
// receiver works, so that one receiver does not block the calls to another.
#include <memory>

#include "api/registry.h"
#include "platform/api_types.h"
#include "receiver/receiver.h"

using rcvlink::Receivers;

namespace {

// The shared pointer keeps the receiver alive until the operation returns, also when another thread
// closes it meanwhile.
template <typename Operation>
long Forward(void* handle, Operation operation) {
  const std::shared_ptr<CIReceiver> receiver = Receivers().Find(handle);
  return receiver ? operation(*receiver) : E_INVALIDARG;
}

}  // namespace

namespace devapi {

long OpenReceiver(wchar_t* port, void** receiver) { return Receivers().Open(port, receiver); }

long CloseReceiver(void* receiver) { return Receivers().Close(receiver); }

long DestroyReceiver(wchar_t* port) { return Receivers().Destroy(port); }

long GetReceiverInfo(void* receiver, void* abortEvent, CReceiverInfo* info) {
  return Forward(receiver, [&](CIReceiver& r) { return r.GetReceiverInfo(abortEvent, info); });
}

long CheckConnection(void* receiver, void* abortEvent, short* answer) {
  return Forward(receiver, [&](CIReceiver& r) { return r.CheckConnection(abortEvent, answer); });
}

long LockConnection(void* receiver, void* abortEvent) {
  return Forward(receiver, [&](CIReceiver& r) { return r.LockConnection(abortEvent); });
}

long UnlockConnection(void* receiver) {
  return Forward(receiver, [&](CIReceiver& r) { return r.UnlockConnection(); });
}

long Abort(void* receiver) {
  return Forward(receiver, [&](CIReceiver& r) { return r.Abort(); });
}

long DownloadFile(void* receiver, wchar_t* name, IStream* stream, CProgressCallback* progress) {
  return Forward(receiver, [&](CIReceiver& r) { return r.DownloadFile(name, stream, progress); });
}

long UploadFile(void* receiver,
                const CFileInfo* info,
                IStream* stream,
                CProgressCallback* progress) {
  return Forward(receiver, [&](CIReceiver& r) { return r.UploadFile(info, stream, progress); });
}

long DeleteFileW(void* receiver, wchar_t* name) {
  return Forward(receiver, [&](CIReceiver& r) { return r.DeleteFile(name); });
}

long RenameFile(void* receiver, wchar_t* oldName, wchar_t* newName) {
  return Forward(receiver, [&](CIReceiver& r) { return r.RenameFile(oldName, newName); });
}

long DCSetRcvBaudrate(void* receiver, unsigned long baudRate) {
  return Forward(receiver, [&](CIReceiver& r) { return r.DCSetRcvBaudrate(baudRate); });
}

long DCSetRcvParity(void* receiver, unsigned char parity) {
  return Forward(receiver, [&](CIReceiver& r) { return r.DCSetRcvParity(parity); });
}

long DCSetRcvRTSControl(void* receiver, unsigned char rts) {
  return Forward(receiver, [&](CIReceiver& r) { return r.DCSetRcvRTSControl(rts); });
}

long DCSetRcvStopbits(void* receiver, unsigned char stopBits) {
  return Forward(receiver, [&](CIReceiver& r) { return r.DCSetRcvStopbits(stopBits); });
}

}  // namespace devapi

long GetConnection(wchar_t*, EInstanceType, CIConnection**) { return E_NOTIMPL; }
