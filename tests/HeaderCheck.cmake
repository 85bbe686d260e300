# Every public header compiles on its own: a generated source per header includes only
# that header (twice, so a missing include guard shows too), and the sources are built
# as an object library with the test suite.
file(GLOB_RECURSE zarl_public_headers CONFIGURE_DEPENDS RELATIVE ${PROJECT_SOURCE_DIR}/include
     ${PROJECT_SOURCE_DIR}/include/zarl/*.h)
set(zarl_header_check_sources "")
foreach(header IN LISTS zarl_public_headers)
    string(MAKE_C_IDENTIFIER ${header} name)
    set(source ${CMAKE_CURRENT_BINARY_DIR}/header_check/${name}.cpp)
    file(CONFIGURE OUTPUT ${source}
         CONTENT "// Generated: ${header} must compile with nothing included before it.\n#include <${header}>\n#include <${header}>\n")
    list(APPEND zarl_header_check_sources ${source})
endforeach()
add_library(zarl_header_check OBJECT ${zarl_header_check_sources})
target_link_libraries(zarl_header_check PRIVATE zarl::core zarl::util zarl_compile_options)
