// A version task that keeps two versions, and a destination with versions of one May.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <string>

#include "version-fixture.h"

class RotationFixture : public VersionFixture {
protected:
    static constexpr uint32_t NOW = 1717243200;  // 2024-06-01 12:00 UTC

    RotationFixture();

    int Rotate(uint32_t now = NOW);
    // Versions of these days: "01", "02.Bad".
    void MakeMay(std::initializer_list<const char*> days);
    static std::string May(const std::string& day);
    void EnableBin();

    TimeZone m_zone{"UTC"};
};
