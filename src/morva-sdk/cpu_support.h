// The processor check of the C interface. Runs on any processor of the family. [any thread]
#pragma once

namespace MORVA::MORVA_SDK {

// The missing feature's name, or null when the engine's code can run here.
char const* missingProcessorFeature();

// The features that matter here and are present, blank-separated.
char const* processorFeatures();

}  // namespace MORVA::MORVA_SDK
