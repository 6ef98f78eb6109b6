// The five functions that script code calls. Thread rule: the script environment's own thread.
#pragma once

#include "native/node_api/callback.h"
#include "native/node_api/value.h"

namespace quorral {

// Throws "Failed to setup Valto module, error code: <code>" for a start-up code other than 0.
void Initialize();

// Hand the registered names, in registration order, to the callback on a later turn of the loop.
void GetNcModels(node_api::Callback callback);
void GetVadModels(node_api::Callback callback);

// A registered name chooses that model for sessions opened from now on, an unknown one throws.
// Anything but a string: noise cancellation goes back to choosing by rate, voice activity keeps
// what it has.
void SetNcModel(node_api::Value value);
void SetVadModel(node_api::Value value);

}  // namespace quorral
