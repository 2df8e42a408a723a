// Discovery: which receiver is at the other end of a connection.
#ifndef RCVLINK_API_DISCOVERY_H_
#define RCVLINK_API_DISCOVERY_H_

#include <memory>
#include <span>

#include "api/families.h"
#include "transport/connection.h"

namespace rcvlink {

// Who asks, and where.
struct Inquiry {
  const wchar_t* caller;  // the exported function, for the report
  const wchar_t* name;    // of the port or device; the receiver is registered under it
  HANDLE abort_event;     // may be null
};

// Asks the families one after the other, and registers the receiver of the first that answers.
// S_FALSE when none does, or when the abort event is signalled before one of them is asked.
HRESULT FindReceiver(std::span<const Family> families,
                     const Inquiry& inquiry,
                     std::unique_ptr<CIConnection> connection,
                     void** receiver);

}  // namespace rcvlink

#endif  // RCVLINK_API_DISCOVERY_H_
