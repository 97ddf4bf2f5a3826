#include "core/PublishedPointer.h"

#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace tavi {
namespace {

std::atomic<int> living{0};

class Counted {
  public:
    explicit Counted(unsigned value) : value_(value), copy_(~value)
    {
        ++living;
    }
    ~Counted()
    {
        value_ = copy_ = 0;
        --living;
    }
    void AddRef()
    {
        AddRefs(1);
    }
    void AddRefs(int count)
    {
        refs_ += count;
    }
    void Release()
    {
        if (--refs_ < 1)
            delete this;
    }
    bool whole() const
    {
        return value_ == ~copy_;
    }

  private:
    std::atomic<int> refs_{1};
    unsigned value_;
    unsigned copy_;
};

// Readers and a writer that swaps without pause: the sanitizers see any touch of a freed or torn object.
TEST(PublishedPointer, SurvivesSwapsAtEveryInterleaving)
{
    constexpr int kReaders = 4;
    constexpr unsigned kSwaps = 300000;
    {
        PublishedPointer<Counted> current;
        EXPECT_EQ(current.acquire(), nullptr);
        std::atomic<bool> done{false};
        std::atomic<unsigned> bad{0}, taken{0};
        std::vector<std::thread> readers;
        for (int i = 0; i < kReaders; ++i) {
            readers.emplace_back([&, i] {
                std::vector<Counted*> held;
                do {
                    if (Counted* object = current.acquire()) {
                        ++taken;
                        bad += !object->whole();
                        held.push_back(object);
                    }
                    // Some readers keep a few references over several swaps.
                    if (held.size() > static_cast<std::size_t>(i)) {
                        bad += !held.front()->whole();
                        for (Counted* object : held)
                            object->Release();
                        held.clear();
                    }
                } while (!done);
                for (Counted* object : held)
                    object->Release();
            });
        }
        for (unsigned i = 0; i < kSwaps; ++i)
            current.replace(i % 64 == 63 ? nullptr : new Counted(i));
        current.replace(new Counted(1));
        while (taken < 1000)
            std::this_thread::yield();
        done = true;
        for (std::thread& reader : readers)
            reader.join();
        EXPECT_EQ(bad, 0u);
        EXPECT_EQ(living, 1);
        EXPECT_TRUE(current.isSet());
    }
    EXPECT_EQ(living, 0);
}

} // namespace
} // namespace tavi
