#include "platform_test.h"

#include <climits>
#include <cstddef>

using namespace kova_test;

namespace {

class sz_list : public testing::Test {
protected:
    ~sz_list() override { KLIBCSzListFree(list_); }
    KLIBSZLIST *list_ = KLIBCSzListAlloc(2);
};

} // namespace

static_assert(offsetof(KLIBSZLIST, nCapacity) == 0 && offsetof(KLIBSZLIST, nItem) == 4);

TEST_F(sz_list, KLIBCSzListAlloc_capacity_isRoomAndNoItem) {
    ASSERT_NE(list_, nullptr);
    EXPECT_EQ(list_->nCapacity, 2U);
    EXPECT_EQ(list_->nItem, 0U);
    EXPECT_FAILS(KLIBCSzListAlloc(0), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCSzListAlloc(-1), nullptr, 0xD00);
}

TEST_F(sz_list, KLIBCSzListPush_beyondTheCapacity_growsAndKeepsTheHandle) {
    KLIBSZLIST *handle = list_;
    for (int i = 0; i < 5000; i++)
        EXPECT_WORKS(KLIBCSzListPush(&handle, std::to_string(i).c_str()), 0);
    EXPECT_EQ(handle, list_);
    EXPECT_EQ(list_->nItem, 5000U);
    EXPECT_GE(list_->nCapacity, 5000U);
    EXPECT_STREQ(KLIBCSzListGet(list_, 0), "0");
    EXPECT_STREQ(KLIBCSzListGet(list_, 4999), "4999");
}

TEST_F(sz_list, KLIBCSzListPush_text_isCopied) {
    char text[] = "abc";
    EXPECT_WORKS(KLIBCSzListPush(&list_, text), 0);
    text[0] = 'x';
    EXPECT_WORKS(KLIBCSzListPush(&list_, ""), 0);
    EXPECT_EQ(texts_of(list_), (std::vector<std::string>{"abc", ""}));
}

TEST_F(sz_list, KLIBCSzListPush_badArguments_areRefused) {
    KLIBSZLIST *none = nullptr;
    EXPECT_FAILS(KLIBCSzListPush(nullptr, "x"), -1, 0xD00);
    EXPECT_FAILS(KLIBCSzListPush(&none, "x"), -1, 0xD00);
    EXPECT_FAILS(KLIBCSzListPush(&list_, nullptr), -1, 0xD00);
    EXPECT_EQ(list_->nItem, 0U);
}

TEST_F(sz_list, KLIBCSzListGet_pastTheEnd_isNull) {
    EXPECT_WORKS(KLIBCSzListPush(&list_, "a"), 0);
    EXPECT_WORKS(KLIBCSzListGet(list_, 1), nullptr);
    EXPECT_WORKS(KLIBCSzListGet(list_, INT_MAX), nullptr);
    EXPECT_FAILS(KLIBCSzListGet(list_, -1), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCSzListGet(nullptr, 0), nullptr, 0xD00);
}

TEST_F(sz_list, KLIBCSzListFind_equalEntry_givesTheFirstIndex) {
    for (const char *text : {"a", "b", "b", ""})
        EXPECT_WORKS(KLIBCSzListPush(&list_, text), 0);
    EXPECT_WORKS(KLIBCSzListFind(list_, "b"), 1);
    EXPECT_WORKS(KLIBCSzListFind(list_, ""), 3);
    EXPECT_WORKS(KLIBCSzListFind(list_, "B"), -1);
    EXPECT_FAILS(KLIBCSzListFind(nullptr, "b"), -1, 0xD00);
    EXPECT_FAILS(KLIBCSzListFind(list_, nullptr), -1, 0xD00);
}

TEST_F(sz_list, KLIBCSzListRemoveAll_list_isEmptyAndUsable) {
    for (const char *text : {"a", "b", "c"})
        EXPECT_WORKS(KLIBCSzListPush(&list_, text), 0);
    const uint32_t capacity = list_->nCapacity;
    KLIBCSzListRemoveAll(list_);
    EXPECT_EQ(list_->nItem, 0U);
    EXPECT_EQ(list_->nCapacity, capacity);
    EXPECT_WORKS(KLIBCSzListPush(&list_, "d"), 0);
    EXPECT_EQ(texts_of(list_), std::vector<std::string>{"d"});
    KLIBCSzListRemoveAll(nullptr);
    KLIBCSzListFree(nullptr);
}
