#include "outcome.h"

#include "sandbox.h"

#include <cerrno>

void
PrintTo(const call_row& row, std::ostream* os)
{
    *os << row.name;
}

void
check_call_row(const call_row& row)
{
    build_tree(row.tree);
    std::string result;
    errno = 0; // warnings that follow no failed call then end in "Success"
    outcome seen = observe([&] { result = row.call(); });
    std::string expected;
    for (const warned& w : row.warnings)
        expected += warning(w.message, w.errnum);
    EXPECT_EQ(result, row.result);
    EXPECT_EQ(seen.err, expected);
    EXPECT_EQ(seen.thrown, row.thrown);
    if (!row.path.empty()) {
        EXPECT_EQ(describe(row.path), row.after) << row.path;
    }
}
