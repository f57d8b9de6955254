// SPDX-License-Identifier: Apache-2.0
// Keeps ICU in the process when the bundle is unloaded. ICU's caches last as long as the process,
// and only the program as a whole may free them (u_cleanup). Were ICU unloaded along with the
// bundle, they would be lost, and made anew when it is loaded again.

#include <dlfcn.h>
#include <unicode/ucnv.h>

namespace {

[[gnu::constructor]] void keepIcuLoaded() {
    Dl_info icu;
    if (dladdr(reinterpret_cast<void*>(&ucnv_open), &icu) != 0) {
        dlopen(icu.dli_fname, RTLD_LAZY | RTLD_NOLOAD | RTLD_NODELETE);
    }
}

}  // namespace
