# Compiles every ```cpp block of README.md as a program of its own (readme_example_N)
# and runs it as a test, so the README's C++ examples cannot drift from the library.
# The examples use the notification port, so their tests hold its lock.
set(readme ${PROJECT_SOURCE_DIR}/README.md)
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${readme})
file(READ ${readme} text)

set(index 0)
while(TRUE)
    string(FIND "${text}" "\n```cpp\n" begin)
    if(begin EQUAL -1)
        break()
    endif()
    math(EXPR begin "${begin} + 8")
    string(SUBSTRING "${text}" ${begin} -1 text)
    string(FIND "${text}" "\n```\n" end)
    if(end EQUAL -1)
        message(FATAL_ERROR "README.md: a ```cpp block is not closed")
    endif()
    math(EXPR end "${end} + 1")
    string(SUBSTRING "${text}" 0 ${end} code)
    string(SUBSTRING "${text}" ${end} -1 text)
    math(EXPR index "${index} + 1")

    # Rewritten only when it changed, so an unrelated README edit rebuilds nothing.
    set(source ${CMAKE_CURRENT_BINARY_DIR}/readme/example_${index}.cpp)
    set(old "")
    if(EXISTS ${source})
        file(READ ${source} old)
    endif()
    if(NOT old STREQUAL code)
        file(WRITE ${source} "${code}")
    endif()

    add_executable(readme_example_${index} ${source})
    target_link_libraries(readme_example_${index} PRIVATE zarl::core zarl_compile_options)
    add_test(NAME readme_example_${index} COMMAND readme_example_${index})
    set_tests_properties(readme_example_${index} PROPERTIES RESOURCE_LOCK zarl_port_23457
                                                            TIMEOUT 60)
endwhile()

if(index EQUAL 0)
    message(FATAL_ERROR "README.md has no ```cpp example")
endif()
