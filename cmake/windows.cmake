# What the Windows cross build needs beyond the Linux one: pugixml built from
# Debian's own source package, every module linked statically against the
# compiler's runtime (the DLLs need nothing beside them), and the test
# programs run under Wine.

# Debian's pugixml source, fetched into the build folder with a private apt
# sources list and lists folder, so the machine's apt configuration stays as
# it is. VARNEL_PUGIXML_SOURCE_DIR may name a source tree unpacked before.
set(VARNEL_PUGIXML_SOURCE_DIR "" CACHE PATH "An unpacked pugixml source tree (fetched from Debian when empty)")
if(NOT VARNEL_PUGIXML_SOURCE_DIR)
  set(apt_dir ${PROJECT_BINARY_DIR}/debian-sources)
  set(VARNEL_PUGIXML_SOURCE_DIR ${apt_dir}/pugixml)
  if(NOT EXISTS ${VARNEL_PUGIXML_SOURCE_DIR}/src/pugixml.cpp)
    message(STATUS "Fetching Debian's pugixml source package into ${apt_dir}")
    file(MAKE_DIRECTORY ${apt_dir}/lists/partial ${apt_dir}/cache/archives/partial ${apt_dir}/sources.list.d
         ${apt_dir}/download)
    file(WRITE ${apt_dir}/sources.list "deb-src http://deb.debian.org/debian bookworm main\n")
    set(apt_options
      -o Dir::Etc::SourceList=${apt_dir}/sources.list -o Dir::Etc::SourceParts=${apt_dir}/sources.list.d
      -o Dir::State::Lists=${apt_dir}/lists -o Dir::Cache=${apt_dir}/cache -o APT::Sandbox::User=root -q)
    execute_process(COMMAND apt-get ${apt_options} update RESULT_VARIABLE failed OUTPUT_QUIET)
    if(NOT failed)
      execute_process(COMMAND apt-get ${apt_options} source --download-only pugixml
                      WORKING_DIRECTORY ${apt_dir}/download RESULT_VARIABLE failed OUTPUT_QUIET)
    endif()
    file(GLOB dsc ${apt_dir}/download/pugixml_*.dsc)
    if(failed OR NOT dsc)
      message(FATAL_ERROR "Could not fetch Debian's pugixml source package (network?)")
    endif()
    file(REMOVE_RECURSE ${VARNEL_PUGIXML_SOURCE_DIR})
    # apt checked the files against the signed release file already.
    execute_process(COMMAND dpkg-source --no-check -x ${dsc} ${VARNEL_PUGIXML_SOURCE_DIR}
                    RESULT_VARIABLE failed OUTPUT_QUIET)
    if(failed)
      message(FATAL_ERROR "dpkg-source could not unpack ${dsc} (package dpkg-dev)")
    endif()
  endif()
endif()
add_library(pugixml STATIC ${VARNEL_PUGIXML_SOURCE_DIR}/src/pugixml.cpp)
target_include_directories(pugixml SYSTEM PUBLIC ${VARNEL_PUGIXML_SOURCE_DIR}/src)
add_library(pugixml::pugixml ALIAS pugixml)

# Debian's nlohmann/json (header only, private to the library), copied into the
# build folder so the cross compiler sees it without the rest of /usr/include.
file(COPY /usr/include/nlohmann DESTINATION ${PROJECT_BINARY_DIR}/cross-include)
add_library(nlohmann_json::nlohmann_json INTERFACE IMPORTED)
set_target_properties(nlohmann_json::nlohmann_json PROPERTIES
  INTERFACE_INCLUDE_DIRECTORIES ${PROJECT_BINARY_DIR}/cross-include)

# mingw's headers declare the reentrant POSIX time functions (localtime_r) on request.
add_compile_definitions(_POSIX_THREAD_SAFE_FUNCTIONS=200112L)

# The compiler's runtime (libstdc++, libgcc, winpthread) inside each module.
add_link_options(-static)

# Test programs run under Wine in a prefix of their own inside the build folder.
set(VARNEL_WINE /usr/lib/wine/wine64 CACHE FILEPATH "Wine, to run the x86_64 test programs")
if(CMAKE_SYSTEM_PROCESSOR STREQUAL "x86_64")
  set(VARNEL_WINEPREFIX ${PROJECT_BINARY_DIR}/wineprefix)
  configure_file(${CMAKE_CURRENT_LIST_DIR}/wine-run.sh.in ${PROJECT_BINARY_DIR}/wine-run.sh @ONLY
                 FILE_PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)
  set(CMAKE_CROSSCOMPILING_EMULATOR ${PROJECT_BINARY_DIR}/wine-run.sh)
endif()
