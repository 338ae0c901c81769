# 32-bit Windows, the shipping target: the meter maker's transport library is 32-bit.
set(VARNEL_MINGW_PROCESSOR i686)
include(${CMAKE_CURRENT_LIST_DIR}/mingw-common.cmake)
