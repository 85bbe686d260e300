#pragma once

// Marks the API of libzarlcore. The library is built with hidden visibility, so only
// what carries this macro is exported; on ELF the same attribute serves callers.
#define ZARL_CORE_API __attribute__((visibility("default")))
