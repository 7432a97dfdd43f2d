// Runs the tests in the locale of the environment, as programs that speak to people do.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <clocale>

int main(int argc, char* argv[])
{
    std::setlocale(LC_ALL, "");  // one that is not installed leaves that of C
    ::testing::InitGoogleMock(&argc, argv);
    return RUN_ALL_TESTS();
}
