// A client's XMLWrapper object, of any component, as a document the requests
// use: each operation is called by name through IDispatch.
#pragma once

#include <oaidl.h>

#include "varnel/xml_wrapper.h"

namespace varnel::detail::com {

// An XMLWrapper whose operations call object's by name. A null object gives a
// document whose every operation raises errc::missing_object.
XMLWrapper dispatchDocument(IDispatch* object);

}  // namespace varnel::detail::com
