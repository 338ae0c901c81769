// Export macro of the varnel shared library: everything else is hidden.
#pragma once

#if defined(VARNEL_BUILDING) && defined(_WIN32)
#define VARNEL_API __declspec(dllexport)
#elif defined(VARNEL_BUILDING)
#define VARNEL_API __attribute__((visibility("default")))
#else
// Windows clients import through the import library's thunks (mingw's auto-import for data).
#define VARNEL_API
#endif
