#include <gtest/gtest.h>

#include <exception>
#include <string>
#include <type_traits>

#include <zarl/util/Exception.h>

using zarl::util::Exception;

static_assert(std::is_base_of_v<std::exception, Exception>);
static_assert(std::is_nothrow_copy_constructible_v<Exception>);
static_assert(std::is_nothrow_copy_assignable_v<Exception>);

// External linkage and no inlining, so the function keeps its own frame and symbol
// for the traceback to name.
__attribute__((noinline)) void ZarlTestThrowFromNamedFunction(const std::string& description) {
    throw Exception(description);
}

namespace {

Exception Caught(const std::string& description) {
    try {
        ZarlTestThrowFromNamedFunction(description);
    } catch (const Exception& e) {
        return e;
    }
    return Exception("not thrown");
}

TEST(Exception, WhatAndReportForManyDescriptions) {
    const std::string descriptions[] = {"",
                                        "boom",
                                        "two\nlines\n",
                                        "\nTraceback:\n",
                                        std::string(10000, 'd'),
                                        std::string("with\0nul", 8)};
    for (const std::string& description : descriptions) {
        const Exception e = Caught(description);
        // what() is a C string, so it ends at an embedded NUL.
        EXPECT_STREQ(e.what(), description.c_str());
        const std::string traceback = e.GetTracebackReport();
        EXPECT_EQ(e.Report(), description + "\nTraceback:\n" + traceback);
        EXPECT_EQ(e.Report(), e.Report());  // a report changes nothing
    }
    EXPECT_EQ(Exception("").Report().compare(0, 12, "\nTraceback:\n"), 0);
}

TEST(Exception, TracebackNamesTheThrowingFunction) {
    const Exception e = Caught("x");
    const std::string traceback = e.GetTracebackReport();
    EXPECT_FALSE(traceback.empty());
    EXPECT_NE(traceback.find("ZarlTestThrowFromNamedFunction"), std::string::npos) << traceback;
    EXPECT_NE(e.Report().find("ZarlTestThrowFromNamedFunction"), std::string::npos);
}

TEST(Exception, CopiesShareTheData) {
    const Exception original = Caught("shared");
    const Exception copy(original);           // NOLINT(performance-unnecessary-copy-initialization)
    EXPECT_EQ(copy.what(), original.what());  // the same buffer, not an equal one
    EXPECT_EQ(copy.Report(), original.Report());

    Exception assigned("other");
    assigned = original;
    EXPECT_EQ(assigned.what(), original.what());
    EXPECT_EQ(assigned.GetTracebackReport(), original.GetTracebackReport());
}

TEST(Exception, CaughtAsStdException) {
    try {
        ZarlTestThrowFromNamedFunction("via base");
        FAIL() << "not thrown";
    } catch (const std::exception& e) {
        EXPECT_STREQ(e.what(), "via base");
    }
}

}  // namespace
