#include "platform_test.h"

using namespace kova_test;

namespace {

class sz_hash : public testing::Test {
protected:
    ~sz_hash() override {
        KLIBCSzHashFree(map_);
        KLIBCSzListFree(list_);
    }
    KLIBSZHASH *map_ = KLIBCSzHashAlloc(1);
    KLIBSZLIST *list_ = KLIBCSzListAlloc(1);
};

} // namespace

TEST_F(sz_hash, KLIBCSzHashSetValue_manyKeys_areFound) {
    for (int i = 0; i < 5000; i++)
        EXPECT_WORKS(KLIBCSzHashSetValue(map_, ("key" + std::to_string(i)).c_str(), std::to_string(i * 2).c_str()), 0);
    for (int i = 0; i < 5000; i++)
        EXPECT_STREQ(KLIBCSzHashGetValue(map_, ("key" + std::to_string(i)).c_str()), std::to_string(i * 2).c_str());
    EXPECT_WORKS(KLIBCSzHashGetValue(map_, "key5000"), nullptr);
    EXPECT_WORKS(KLIBCSzHashEnumKey(map_, list_), 5000);
    EXPECT_STREQ(KLIBCSzListGet(list_, 0), "key0");
    EXPECT_STREQ(KLIBCSzListGet(list_, 4999), "key4999");
}

TEST_F(sz_hash, KLIBCSzHashSetValue_presentKey_keepsItsPlace) {
    EXPECT_WORKS(KLIBCSzHashSetValue(map_, "b", "1"), 0);
    EXPECT_WORKS(KLIBCSzHashSetValue(map_, "a", "2"), 0);
    EXPECT_WORKS(KLIBCSzHashSetValue(map_, "b", ""), 0);
    EXPECT_STREQ(KLIBCSzHashGetValue(map_, "b"), "");
    EXPECT_WORKS(KLIBCSzHashEnumKey(map_, list_), 2);
    EXPECT_EQ(texts_of(list_), (std::vector<std::string>{"b", "a"}));
}

TEST_F(sz_hash, KLIBCSzHashSetValue_ownValue_mayBeGivenAgain) {
    EXPECT_WORKS(KLIBCSzHashSetValue(map_, "a", "value"), 0);
    EXPECT_WORKS(KLIBCSzHashSetValue(map_, "a", KLIBCSzHashGetValue(map_, "a")), 0);
    EXPECT_STREQ(KLIBCSzHashGetValue(map_, "a"), "value");
}

TEST_F(sz_hash, KLIBCSzHashSetValue_texts_areCopied) {
    char key[] = "key";
    char value[] = "value";
    EXPECT_WORKS(KLIBCSzHashSetValue(map_, key, value), 0);
    key[0] = value[0] = 'x';
    EXPECT_STREQ(KLIBCSzHashGetValue(map_, "key"), "value");
}

TEST_F(sz_hash, KLIBCSzHashEnumKey_list_isAppendedTo) {
    EXPECT_WORKS(KLIBCSzListPush(&list_, "before"), 0);
    EXPECT_WORKS(KLIBCSzHashEnumKey(map_, list_), 0);
    EXPECT_WORKS(KLIBCSzHashSetValue(map_, "a", "1"), 0);
    EXPECT_WORKS(KLIBCSzHashEnumKey(map_, list_), 1);
    EXPECT_EQ(texts_of(list_), (std::vector<std::string>{"before", "a"}));
}

TEST_F(sz_hash, KLIBCSzHash_badArguments_areRefused) {
    EXPECT_FAILS(KLIBCSzHashAlloc(0), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCSzHashSetValue(nullptr, "a", "b"), -1, 0xD00);
    EXPECT_FAILS(KLIBCSzHashSetValue(map_, nullptr, "b"), -1, 0xD00);
    EXPECT_FAILS(KLIBCSzHashSetValue(map_, "", "b"), -1, 0xD00);
    EXPECT_FAILS(KLIBCSzHashSetValue(map_, "a", nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBCSzHashGetValue(nullptr, "a"), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCSzHashGetValue(map_, nullptr), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCSzHashEnumKey(nullptr, list_), -1, 0xD00);
    EXPECT_FAILS(KLIBCSzHashEnumKey(map_, nullptr), -1, 0xD00);
    KLIBCSzHashFree(nullptr);
}
