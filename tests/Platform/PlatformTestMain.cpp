#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "NamedObjectsHelpers.h"

int main(int argumentCount, char** arguments) {
    int exitCode = 0;
    if (Varnholt::TestSupport::RunHelper(argumentCount, arguments, Varnholt::Platform::NamedObjectsHelpers(),
                                         exitCode)) {
        return exitCode;
    }
    testing::InitGoogleMock(&argumentCount, arguments);
    return RUN_ALL_TESTS();
}
