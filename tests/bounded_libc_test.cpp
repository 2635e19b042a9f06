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

TEST(BoundedLibcTest, FscanfReadsWordsThatFit) {
    std::string text = " \tfour five+\nx";
    FILE* const stream = fmemopen(text.data(), text.size(), "r");
    char word[5];
    EXPECT_EQ(fscanf_s(stream, "%d", word, sizeof(word)), EOF);
    EXPECT_EQ(fscanf_s(stream, "%s", word, sizeof(word)), 1);
    EXPECT_STREQ(word, "four");
    EXPECT_EQ(fscanf_s(stream, "%s", word, sizeof(word)), EOF);
    EXPECT_EQ(fscanf_s(stream, "%s", word, sizeof(word)), 1);
    EXPECT_STREQ(word, "x");
    EXPECT_EQ(fscanf_s(stream, "%s", word, sizeof(word)), EOF);
    fclose(stream);
}

static int Format(char* dest, size_t destMax, size_t count, const char* format, ...) {
    va_list args;
    va_start(args, format);
    const int length = vsnprintf_s(dest, destMax, count, format, args);
    va_end(args);
    return length;
}

TEST(BoundedLibcTest, VsnprintfTruncatesLongResults) {
    char buffer[] = "before";
    EXPECT_EQ(Format(buffer, 4, 4, "%d", 1), -1);
    EXPECT_STREQ(buffer, "before");
    EXPECT_EQ(Format(buffer, 4, 3, "%d", 1234), -1);
    EXPECT_STREQ(buffer, "123");
    EXPECT_EQ(Format(buffer, 4, 3, "%d", 567), 3);
    EXPECT_EQ(Format(buffer, 4, 3, "%lc", 0x7FFFFFFF), -1);
}
