# Warnings and sanitizers shared by every target of the project.
set(ZARL_SANITIZE "" CACHE STRING "Comma-separated -fsanitize= list (empty: none)")

add_library(zarl_compile_options INTERFACE)
target_compile_options(zarl_compile_options INTERFACE -Wall -Wextra -Wpedantic)
if(ZARL_WERROR)
    target_compile_options(zarl_compile_options INTERFACE -Werror)
endif()

if(ZARL_SANITIZE)
    add_compile_options(-fsanitize=${ZARL_SANITIZE} -fno-omit-frame-pointer)
    add_link_options(-fsanitize=${ZARL_SANITIZE})
    if(ZARL_SANITIZE MATCHES "undefined")
        add_compile_options(-fno-sanitize-recover=all)
    endif()
endif()
