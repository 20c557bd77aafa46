#include "Runtime/Allocator/Owned.h"

#include <gtest/gtest.h>
#include <string>

// The address sanitizer reports a block that is freed twice or never.
namespace {

std::string gDestroyed;

struct Base {
    virtual ~Base() = default;
};

struct Named : Base {
    explicit Named(char objectName) : name(objectName) {}
    ~Named() override { gDestroyed += name; }
    char name;
};

Owned<Named> MakeNamed(char name) { return Owned<Named>(New<Named>(kMemLabelRandom, name), kMemLabelRandom); }

class OwnedTest : public testing::Test {
protected:
    OwnedTest() { gDestroyed.clear(); }
};

} // namespace

TEST_F(OwnedTest, DestroysTheWholeObjectThroughItsBase) {
    {
        const Owned<Base> object(New<Named>(kMemLabelRandom, 'a'), kMemLabelRandom);
        EXPECT_EQ("", gDestroyed);
    }
    EXPECT_EQ("a", gDestroyed);
}

TEST_F(OwnedTest, MoveAssignmentDestroysThePreviousObject) {
    Owned<Named> target = MakeNamed('a');
    Owned<Named> source = MakeNamed('b');
    target = std::move(source);
    EXPECT_EQ("a", gDestroyed);
    EXPECT_EQ(nullptr, source.get());
    EXPECT_EQ('b', target->name);
}

TEST_F(OwnedTest, KeepsItsObjectWhenAssignedToItself) {
    Owned<Named> object = MakeNamed('a');
    object = static_cast<Owned<Named>&&>(object);
    EXPECT_EQ("", gDestroyed);
    ASSERT_NE(nullptr, object.get());
    EXPECT_EQ('a', object->name);
}

TEST_F(OwnedTest, ReleasedObjectIsTheCallers) {
    Named* released = nullptr;
    {
        Owned<Named> object = MakeNamed('a');
        released = object.release();
        EXPECT_FALSE(object);
    }
    EXPECT_EQ("", gDestroyed);
    Delete(released, kMemLabelRandom);
}
