#include <bounded_libc.h>
#include <gmock/gmock.h>

#include <cerrno>

TEST(BoundedLibcTest, MemsetWritesNothingWhenTheCountExceedsTheBuffer) {
    char buffer[] = "abc";
    EXPECT_EQ(memset_s(buffer, 2, 'x', 3), ERANGE);
    EXPECT_STREQ(buffer, "abc");
    EXPECT_EQ(memset_s(buffer, 2, 'x', 2), 0);
    EXPECT_STREQ(buffer, "xxc");
}
