# Compares the symbols that a shared library exports with the list checked in beside
# this script, or (with -DUPDATE=ON) rewrites the list.
#
#   cmake -DNM=<nm> -DLIBRARY=<libzarlcore.so> -DLIST=<abi/libzarlcore.symbols> [-DUPDATE=ON]
#         -P abi/CheckSymbols.cmake
#
# The list holds the demangled names of the defined dynamic symbols (nm -D
# --defined-only --demangle), one a line, without addresses or types, sorted bytewise
# (as LC_ALL=C sort does) and without repeats.
cmake_minimum_required(VERSION 3.25)

foreach(variable NM LIBRARY LIST)
    if(NOT DEFINED ${variable})
        message(FATAL_ERROR "CheckSymbols.cmake: -D${variable}=... is required")
    endif()
endforeach()

execute_process(COMMAND ${CMAKE_COMMAND} -E env LC_ALL=C ${NM} -D --defined-only --demangle ${LIBRARY}
                OUTPUT_VARIABLE output ERROR_VARIABLE errors RESULT_VARIABLE result)
if(NOT result EQUAL 0)
    message(FATAL_ERROR "${NM} failed on ${LIBRARY}: ${errors}")
endif()

# Each line is "<address> <type> <name>"; the name may hold spaces. A semicolon would
# split a CMake list, and no C++ name holds one.
if(output MATCHES ";")
    message(FATAL_ERROR "${NM} printed a semicolon, which this script cannot handle")
endif()
string(REPLACE "\n" ";" lines "${output}")
set(symbols "")
foreach(line IN LISTS lines)
    if(line MATCHES "^[0-9a-fA-F]* +[A-Za-z] +(.+)$")
        list(APPEND symbols "${CMAKE_MATCH_1}")
    endif()
endforeach()
list(REMOVE_DUPLICATES symbols)
list(SORT symbols COMPARE STRING CASE SENSITIVE)
string(REPLACE ";" "\n" actual "${symbols}")
set(actual "${actual}\n")

get_filename_component(name ${LIBRARY} NAME)
if(UPDATE)
    file(WRITE ${LIST} "${actual}")
    list(LENGTH symbols count)
    message(STATUS "${LIST}: ${count} symbols of ${name}")
    return()
endif()

if(NOT EXISTS ${LIST})
    message(FATAL_ERROR "${LIST} does not exist: run `make abi-update`")
endif()
file(READ ${LIST} expected)
if(NOT actual STREQUAL expected)
    # Show what leaked out (+) and what disappeared (-).
    string(REPLACE "\n" ";" expected_lines "${expected}")
    list(REMOVE_ITEM expected_lines "")
    set(report "")
    foreach(symbol IN LISTS symbols)
        if(NOT symbol IN_LIST expected_lines)
            string(APPEND report "  + ${symbol}\n")
        endif()
    endforeach()
    foreach(symbol IN LISTS expected_lines)
        if(NOT symbol IN_LIST symbols)
            string(APPEND report "  - ${symbol}\n")
        endif()
    endforeach()
    message(FATAL_ERROR
            "The symbols that ${name} exports differ from ${LIST}:\n${report}"
            "A deliberate change updates the list in the same commit: `make abi-update`.")
endif()
message(STATUS "${name} exports exactly the symbols of ${LIST}")
