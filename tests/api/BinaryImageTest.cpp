// The firmware image object: its interface map, its data, and reference
// counts kept consistent under concurrent use.
#include "api/BinaryImage.h"

#include <gtest/gtest.h>

#include <thread>
#include <vector>

#include "foundation/QelMutex.h"
#include "foundation/Status.h"

namespace qel::api {
namespace {

BinaryImageObject* Create() {
    BinaryImageObject* image = nullptr;
    EXPECT_EQ(BinaryImageObject::CreateInstance(&image), 0);
    EXPECT_NE(image, nullptr);
    return image;
}

TEST(BinaryImage, AnswersItsOwnInterfaceOnly) {
    BinaryImageObject* image = Create();
    EXPECT_EQ(image->AddRef(), 1u);
    void* out = reinterpret_cast<void*>(1);
    EXPECT_EQ(image->QueryInterface(kIID_IkrSysFirmware, &out), fnd::kStatusNoInterface);
    EXPECT_EQ(out, nullptr);
    EXPECT_EQ(image->QueryInterface(kIID_IkrSysBinaryImage, &out), 0);
    EXPECT_EQ(out, static_cast<IkrSysBinaryImage*>(image));
    void* unknown = nullptr;
    EXPECT_EQ(image->QueryInterface(kIID_IUnknown, &unknown), 0);
    EXPECT_EQ(unknown, out);
    EXPECT_EQ(image->Release(), 2u);
    EXPECT_EQ(image->Release(), 1u);
    EXPECT_EQ(image->Release(), 0u);  // destroyed; the leak check sees it freed
}

TEST(BinaryImage, SizeAndData) {
    BinaryImageObject* image = Create();
    image->AddRef();
    uint32_t size = 99;
    const uint8_t* data = reinterpret_cast<const uint8_t*>(1);
    EXPECT_EQ(image->GetSize(nullptr), fnd::kStatusPointer);
    EXPECT_EQ(image->GetData(nullptr), fnd::kStatusPointer);
    EXPECT_EQ(image->GetSize(&size), 0);
    EXPECT_EQ(image->GetData(&data), 0);
    EXPECT_EQ(size, 0u);
    EXPECT_EQ(data, nullptr) << "never allocated";

    uint8_t* buffer = image->Allocate(4);
    buffer[0] = 0xAB;
    image->SetSize(9);  // no more than was allocated
    EXPECT_EQ(image->GetSize(&size), 0);
    EXPECT_EQ(size, 4u);
    EXPECT_EQ(image->GetData(&data), 0);
    EXPECT_EQ(data[0], 0xAB);
    image->Release();
}

TEST(BinaryImage, ConcurrentReferencesBalance) {
    BinaryImageObject* image = Create();
    image->AddRef();
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([image] {
            for (int i = 0; i < 2000; ++i) {
                image->AddRef();
                image->Release();
            }
        });
    for (std::thread& t : threads) t.join();
    EXPECT_EQ(image->Release(), 0u);
}

TEST(BinaryImageDeathTest, UnbalancedReleaseAborts) {
    EXPECT_DEATH(
        {
            BinaryImageObject* image = Create();
            image->Release();
        },
        "");
}

TEST(CQelMutex, KnowsItsOwner) {
    fnd::CQelMutex mutex;
    EXPECT_FALSE(mutex.IsLockedByCaller());
    mutex.Lock();
    EXPECT_TRUE(mutex.IsLockedByCaller());
    bool otherSees = true;
    std::thread([&] { otherSees = mutex.IsLockedByCaller(); }).join();
    EXPECT_FALSE(otherSees);
    mutex.Unlock();
    EXPECT_FALSE(mutex.IsLockedByCaller());
}

}  // namespace
}  // namespace qel::api
