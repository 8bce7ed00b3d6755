// ka::Arena: zero-filled records, chunks of bounded size, long texts in blocks of their own, and
// what a Reset keeps for the next Process.
#include "platform/arena.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <string>

#include "ka/vast_records.h"

namespace {

TEST(Arena, RecordsZeroFilledAlignedAndStringsCopied) {
    ka::Arena arena;
    for (int round = 0; round < 2; ++round) {
        for (int i = 0; i < 500; ++i) {
            AdTracking* tracking = arena.New<AdTracking>();
            EXPECT_EQ(reinterpret_cast<uintptr_t>(tracking) % alignof(AdTracking), 0u);
            EXPECT_TRUE(tracking->event == nullptr && tracking->offset == 0 &&
                        tracking->next == nullptr);
            // Dirties the memory the next round gets again.
            tracking->offset = -1;
            tracking->event = arena.CopyText("progress-event", 8);
            EXPECT_STREQ(tracking->event, "progress");
        }
        EXPECT_EQ(arena.CopyString(nullptr), nullptr);
        EXPECT_STREQ(arena.CopyString(""), "");
        arena.Reset();
    }
}

TEST(Arena, ChunksStayBoundedAndLongTextsGoAtReset) {
    ka::Arena arena;
    const std::string longText(ka::Arena::kOwnBlockBytes + 1, 'x');
    for (int i = 0; i < 3; ++i) EXPECT_EQ(arena.CopyString(longText.c_str()), longText);
    const size_t ownBlocks = 3 * longText.size() + 3;
    EXPECT_EQ(arena.HeldBytes(), ownBlocks);  // no chunk yet
    // 4 MiB of records: chunks grow to kMaxChunk and no further.
    size_t records = 0;
    for (; records * sizeof(AdData) < 4 * 1024 * 1024; ++records) arena.New<AdData>();
    const size_t held = arena.HeldBytes() - ownBlocks;
    EXPECT_GE(held, records * sizeof(AdData));
    EXPECT_LE(held, records * sizeof(AdData) + ka::Arena::kMaxChunk + ka::Arena::kFirstChunk);
    // Reset frees the texts' blocks and the chunks past what it keeps.
    arena.Reset();
    EXPECT_LE(arena.HeldBytes(), ka::Arena::kKeptBytes);
    EXPECT_GE(arena.HeldBytes(), ka::Arena::kKeptBytes - ka::Arena::kMaxChunk);
    // The kept chunks serve the next Process without growing.
    const size_t kept = arena.HeldBytes();
    for (size_t i = 0; i * sizeof(AdData) < kept / 2; ++i) arena.New<AdData>();
    EXPECT_EQ(arena.HeldBytes(), kept);
}

}  // namespace
