// The driver of Plain receivers: the smallest family that can be found, listed and downloaded from.
#ifndef RCVLINK_TESTS_FAMILY_PLAIN_PROTOCOL_H_
#define RCVLINK_TESTS_FAMILY_PLAIN_PROTOCOL_H_

#include <memory>
#include <string>

#include "receiver/abstract_protocol.h"

class CPlainProtocol : public CAbstractProtocol {
 public:
  explicit CPlainProtocol(std::unique_ptr<CIConnection> connection);

  // Whether a Plain receiver answers.
  static bool Probe(CIConnection* connection, HANDLE abort_event);

  HRESULT GetReceiverInfo(HANDLE abort_event, CReceiverInfo* info) override;
  HRESULT GetFiles(CFileList* files) override;
  HRESULT DownloadFile(const wchar_t* name, IStream* stream, CProgressCallback* progress) override;

 private:
  bool IsAnswering(HANDLE abort_event) override { return Probe(connection(), abort_event); }

  // The answer to a line. An abort raises S_FALSE.
  std::string Ask(const std::string& line);
};

#endif  // RCVLINK_TESTS_FAMILY_PLAIN_PROTOCOL_H_
