#pragma once

// Marks the API of libzarlutil. The library is built with hidden visibility, so only
// what carries this macro is exported; on ELF the same attribute serves callers.
#define ZARL_UTIL_API __attribute__((visibility("default")))
