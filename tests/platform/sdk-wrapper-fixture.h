// A fresh scripted platform, captured log lines and a scratch folder for each test of the wrapper.
#pragma once

#include <gtest/gtest.h>

#include "fake/fake-keld.h"
#include "platform/keld-sdk-wrapper.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

class SdkWrapperTest : public testing::Test {
protected:
    FakeKeld& m_fake = FakeKeld::Reset();
    LogCapture m_log;
    TempDir m_dir;
};
