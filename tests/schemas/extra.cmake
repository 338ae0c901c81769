# The schemas as built (with the version filled in), libxml2 as the validator, and the
# documents the end-to-end programs kept: those run first, after the old ones are cleared.
find_package(LibXml2 REQUIRED)
target_sources(${target} PRIVATE ${PROJECT_SOURCE_DIR}/cli/document_check.cpp)
target_include_directories(${target} PRIVATE ${PROJECT_SOURCE_DIR}/cli ${PROJECT_BINARY_DIR}/include)
target_link_libraries(${target} PRIVATE LibXml2::LibXml2)
target_compile_definitions(${target} PRIVATE
  VARNEL_SCHEMA_DIR="${PROJECT_BINARY_DIR}/share/varnel/schemas")
set(properties PROPERTIES ENVIRONMENT VARNEL_KEPT_DOCUMENTS=${VARNEL_KEPT_DOCUMENTS} FIXTURES_REQUIRED kept_documents)
add_test(NAME schemas_clear_kept_documents COMMAND ${CMAKE_COMMAND} -E rm -rf ${VARNEL_KEPT_DOCUMENTS})
set_tests_properties(schemas_clear_kept_documents PROPERTIES FIXTURES_SETUP kept_documents_cleared)
