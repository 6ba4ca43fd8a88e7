#include "platform/error-handler.h"

#include <gtest/gtest.h>

#include <thread>
#include <vector>

namespace {

struct SetCase {
    std::vector<int> codes;
    int outcome;
};
const SetCase kCases[] = {
    {{0},                   0  },
    {{-8},                  0  },
    {{-16},                 0  },
    {{-18},                 0  },
    {{-2},                  -2 },
    {{-1},                  -1 },
    {{-19},                 -19},
    {{-7},                  -7 },
    {{-99},                 -99},
 // The last outcome that counts stands.
    {{-2, -3},              -3 },
    {{-2, -3, -15},         -15},
    {{0, -2},               -2 },
    {{-16, -10},            -10},
 // One that can be ignored overwrites nothing.
    {{-2, 0},               -2 },
    {{-2, -8},              -2 },
    {{-2, -16},             -2 },
    {{-2, -18},             -2 },
    {{0, -8, -16, -18},     0  },
 // "Destination quota full" and "Interrupted" are final, whichever comes first.
    {{-19, -2},             -19},
    {{-2, -19},             -19},
    {{-2, -19, -3, 0, -1},  -19},
    {{-1, -2},              -1 },
    {{-1, -19},             -1 },
    {{-1, 0},               -1 },
    {{0, -1, -3},           -1 },
    {{-7, -3, -1, -19, -7}, -1 },
};

TEST(ErrorHandlerTest, OutcomesAddUpByTheRules) {
    for (const SetCase& row : kCases) {
        Ferrix::ErrorHandler handler;
        std::string name;
        for (const int code : row.codes) {
            handler.Set(7, code);
            name += std::to_string(code) + " ";
        }
        EXPECT_EQ(row.outcome, handler.Get(7)) << name;
    }
}

TEST(ErrorHandlerTest, TaskWithoutAnEntryIsASystemError) {
    Ferrix::ErrorHandler handler;
    handler.Set(7, 0);
    EXPECT_EQ(-3, handler.Get(8));
    EXPECT_EQ(0, handler.Get(7));
}

TEST(ErrorHandlerTest, ClearForgetsOneTask) {
    Ferrix::ErrorHandler handler;
    handler.Set(7, -19);
    handler.Set(8, -1);
    handler.Clear(7);
    handler.Clear(9);
    EXPECT_EQ(-3, handler.Get(7));
    EXPECT_EQ(-1, handler.Get(8));
    handler.Set(7, -2);
    EXPECT_EQ(-2, handler.Get(7));
}

TEST(ErrorHandlerTest, TaskIdsHave64Bits) {
    Ferrix::ErrorHandler handler;
    handler.Set(0x100000007u, -2);
    EXPECT_EQ(-3, handler.Get(7));
}

TEST(ErrorHandlerTest, InstanceIsOne) {
    EXPECT_EQ(&Ferrix::ErrorHandler::GetInstance(), &Ferrix::ErrorHandler::GetInstance());
}

TEST(ErrorHandlerTest, ThreadsOfManyTasksDoNotDisturbEachOther) {
    Ferrix::ErrorHandler handler;
    std::vector<std::thread> threads;
    for (uint64_t task = 1; task <= 4; ++task) {
        threads.emplace_back([&handler, task] {
            for (int round = 0; round < 1000; ++round) {
                handler.Clear(task);
                handler.Set(task, 0);
                handler.Set(task, -static_cast<int>(task) - 8);
                ASSERT_EQ(-static_cast<int>(task) - 8, handler.Get(task));
                handler.Set(100, -19);
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(-19, handler.Get(100));
}

}  // namespace
