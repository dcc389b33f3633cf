// The owning handle of a buffered processor in tests: created initialised,
// released and destroyed at the end of its scope (also when an assertion
// returns early).
#ifndef KIV_TESTS_SUPPORT_PROCESSOR_PTR_H
#define KIV_TESTS_SUPPORT_PROCESSOR_PTR_H

#include <gtest/gtest.h>

#include <memory>

#include "core/VFilterBufferedProcessorImpl.h"

struct ProcessorDeleter {
    void operator()(VFilterBufferedProcessorImpl* processor) const {
        processor->release();
        BufferedProcessor_Destroy(processor);
    }
};
using ProcessorPtr = std::unique_ptr<VFilterBufferedProcessorImpl, ProcessorDeleter>;

inline ProcessorPtr ProcessorTest_create() {
    ProcessorPtr processor(static_cast<VFilterBufferedProcessorImpl*>(BufferedProcessor_Create()));
    EXPECT_EQ(0, processor->initialize());
    return processor;
}

#endif
