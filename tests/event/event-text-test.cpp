#include "event/event-text.h"

#include <gtest/gtest.h>

#include "event/event-counter.h"

namespace {

TEST(EventTest, ADefaultEventIsEmpty) {
    const Event event;
    EXPECT_EQ(EV_EMPTY, event.type);
    EXPECT_EQ(WAITTING, event.status);
    EXPECT_EQ(0U, event.task_id);
    EXPECT_EQ("", event.path);
    EXPECT_EQ(0U, event.flags);
    EXPECT_TRUE(event.IsEmpty());
}

TEST(EventTest, AnEventWithoutPathTypeOrTaskIsEmpty) {
    EXPECT_FALSE((Event{EV_COPY, WAITTING, 1, "/a", 0}.IsEmpty()));
    EXPECT_TRUE((Event{EV_EMPTY, WAITTING, 1, "/a", 0}.IsEmpty()));
    EXPECT_TRUE((Event{EV_COPY, WAITTING, 0, "/a", 0}.IsEmpty()));
    EXPECT_TRUE((Event{EV_COPY, WAITTING, 1, "", 0}.IsEmpty()));
}

TEST(EventTest, TheScanBitMakesAScanWhateverTheType) {
    EXPECT_TRUE((Event{EV_REMOVE, WAITTING, 1, "/a", EVENT_FLAG_SCAN}.IsScan()));
    EXPECT_FALSE((Event{EV_CREATE, WAITTING, 1, "/a", EVENT_FLAG_DIR}.IsScan()));
}

TEST(EventTextTest, NamesEveryTypeStatusAndKind) {
    const struct {
        Event event;
        const char* text;
    } cases[] = {
        {{EV_CREATE, WAITTING, 7, "/", 3},                   "Event<EV_CREATE> (WAITTING): [7] / (scan,dir)"    },
        {{EV_EMPTY, PROCESSING, 0, "", 0},                   "Event<EV_EMPTY> (PROCESSING): [0]  (file_op,file)"},
        {{EV_REMOVE, BLOCKING, 1, "/a b", 1},
         "Event<EV_REMOVE> (BLOCKING): [1] /a b (file_op,dir)"                                                  },
        {{EV_COPY, DONE, 18446744073709551615ULL, "/%s", 2},
         "Event<EV_COPY> (DONE): [18446744073709551615] /%s (scan,file)"                                        },
        {{EV_COPY, ABORT, 2, "/x", 0},                       "Event<EV_COPY> (ABORT): [2] /x (file_op,file)"    },
    };
    for (const auto& c : cases) {
        EXPECT_EQ(c.text, ToString(c.event));
        EXPECT_STREQ(c.text, EventText(c.event).CStr());
    }
}

TEST(EventTextTest, TakesPathsOfEveryLengthWhole) {
    for (size_t size = 1; size < 1000; ++size) {
        const std::string path = "/" + std::string(size, 'x');
        EXPECT_EQ("Event<EV_COPY> (PROCESSING): [18446744073709551615] " + path + " (file_op,file)",
                  ToString({EV_COPY, PROCESSING, UINT64_MAX, path, 0}));
    }
}

TEST(EventTextTest, KeepsBytesThatAreNoText) {
    const std::string path = "/a\n\"%n\xff";
    EXPECT_EQ("Event<EV_COPY> (WAITTING): [1] " + path + " (file_op,file)",
              ToString({EV_COPY, WAITTING, 1, path, 0}));
}

TEST(EventCounterTest, AddsSubtractsComparesAndPrints) {
    EventCounter sum = EventCounter::Of(EV_REMOVE, WAITTING) + EventCounter::Of(EV_COPY, ABORT);
    EXPECT_EQ((EventCounter{2, 1, 1}), sum);
    EXPECT_EQ("{count: 2, processing: 1, non-remove: 1}", sum.ToString());
    sum += EventCounter::Of(EV_CREATE, PROCESSING);
    EXPECT_EQ((EventCounter{3, 2, 2}), sum);
    sum -= EventCounter::Of(EV_COPY, BLOCKING);
    EXPECT_EQ((EventCounter{2, 2, 1}), sum);
    EXPECT_EQ((EventCounter{-1, 0, -1}), EventCounter{} - EventCounter::Of(EV_COPY, DONE));
    EXPECT_NE((EventCounter{1, 0, 0}), (EventCounter{1, 1, 0}));
}

}  // namespace
