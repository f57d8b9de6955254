// SPDX-License-Identifier: Apache-2.0
// A library that lacks one of a bundle's three functions.

extern "C" {

[[gnu::visibility("default")]] void _us_set_bundle_context_instance_without_create_activator() {}

[[gnu::visibility("default")]] void _us_destroy_activator_without_create_activator() {}

}  // extern "C"
