// Xerces-C++ for the length of a test program: the module leaves that to its host.
#ifndef ZMC_TESTS_SUPPORT_XERCESENVIRONMENT_H
#define ZMC_TESTS_SUPPORT_XERCESENVIRONMENT_H

#include <gtest/gtest.h>

#include <xercesc/util/PlatformUtils.hpp>

namespace zmctest {

using namespace zelm;

class XercesEnvironment : public ::testing::Environment {
public:
    void SetUp() override { xercesc::XMLPlatformUtils::Initialize(); }
    void TearDown() override { xercesc::XMLPlatformUtils::Terminate(); }
};

inline ::testing::Environment* const kXercesEnvironment =
    ::testing::AddGlobalTestEnvironment(new XercesEnvironment);

}  // namespace zmctest

#endif
