// Discovery: finds out which receiver is at the other end of a connection.
#ifndef RCVLINK_API_DISCOVERY_H_
#define RCVLINK_API_DISCOVERY_H_

#include <memory>
#include <span>

#include "api/families.h"
#include "transport/connection.h"

namespace rcvlink {

// Which exported function searches, and where.
struct Inquiry {
  const wchar_t* caller;  // the exported function, for the report
  const wchar_t* name;    // of the port or device; the receiver is registered under it
  HANDLE abort_event;     // may be null
};

// Asks for the families one after the other, and registers the receiver that answers first. S_FALSE
// when none answers, or when the abort event is signalled before a family is asked for.
HRESULT FindReceiver(std::span<const Family> families,
                     const Inquiry& inquiry,
                     std::unique_ptr<CIConnection> connection,
                     void** receiver);

}  // namespace rcvlink

#endif  // RCVLINK_API_DISCOVERY_H_
