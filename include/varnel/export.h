// Export macro of the varnel shared library: everything else is hidden.
#pragma once

#if defined(VARNEL_BUILDING)
#define VARNEL_API __attribute__((visibility("default")))
#else
#define VARNEL_API
#endif
