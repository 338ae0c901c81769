# 64-bit Windows: the build that runs under Wine here.
set(VARNEL_MINGW_PROCESSOR x86_64)
include(${CMAKE_CURRENT_LIST_DIR}/mingw-common.cmake)
