// Reads document packages.

#include <exception>
#include <stdexcept>

#include "platform/filesystem/filesystem.h"
#include "serialization/reading/result_keys.h"
#include "serialization/serialization.h"

namespace EditorServices {

using platform::filesystem::exists;

json::Object Serialization::readPackageDocument(std::u16string path) const {
    json::Object result;
    try {
        if (!exists(path)) {
            // No "exception" here, unlike for a text file: clients tell the two cases apart by it.
            result[kStatusKey] = false;
            return result;
        }
        throw std::runtime_error("Document packages cannot be read yet.");
    } catch (const std::exception& error) {
        result[kExceptionKey] = error.what();
        result[kStatusKey] = false;
    }
    return result;
}

}  // namespace EditorServices
