# The C interface loads the shipped simulated transport beside libvarnel.
add_dependencies(${target} vantrix32)

# The header is C11: a C program uses it linking libvarnel alone.
add_executable(capi_c_client ${dir}/c_client.c)
set_target_properties(capi_c_client PROPERTIES C_STANDARD 11 C_STANDARD_REQUIRED ON C_EXTENSIONS OFF)
target_compile_options(capi_c_client PRIVATE -Wall -Wextra -pedantic $<$<BOOL:${VARNEL_WERROR}>:-Werror>)
target_link_libraries(capi_c_client PRIVATE varnel)
add_test(NAME CInterface.UsedFromC COMMAND capi_c_client /nonexistent/varnel-test/libnotransport.so)
