// Script functions over the start-up routine and the model lists.
#include "native_modules/quorral_valto/src/bindings/script_functions.h"

#include <string>
#include <utility>
#include <vector>

#include "native/node_api/environment.h"
#include "native/node_api/native_value.h"
#include "native_modules/quorral_valto/src/valto_wrapper/models.h"
#include "native_modules/quorral_valto/src/valto_wrapper/valto_wrapper.h"

namespace quorral {

using node_api::Environment;
using node_api::NativeValue;
using node_api::WrapCallback;
using Names = std::vector<std::string>;

void Initialize() {
    if (const int code = ValtoInitialize(); code != 0) {
        Environment::Throw("Failed to setup Valto module, error code: ", code);
    }
}

void GetNcModels(node_api::Callback callback) {
    WrapCallback<Names>(std::move(callback))(NcModelNames());
}

void GetVadModels(node_api::Callback callback) {
    WrapCallback<Names>(std::move(callback))(VadModelNames());
}

void SetNcModel(node_api::Value value) {
    const auto name = NativeValue<std::string>::Get(value);
    if (!name) {
        ChooseNcModelByRate();
    } else if (!ChooseNcModel(*name)) {
        Environment::Throw("Invalid noise cancellation model");
    }
}

void SetVadModel(node_api::Value value) {
    const auto name = NativeValue<std::string>::Get(value);
    if (name && !ChooseVadModel(*name)) {
        Environment::Throw("Invalid voice acticity detection model");
    }
}

}  // namespace quorral
