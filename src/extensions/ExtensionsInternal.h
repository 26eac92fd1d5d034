// Not part of the interface: the package list's start-up and shutdown.
#pragma once

namespace ovrametadata {

// Registers the packages of the machine's and the user's folders and loads
// the dictionaries, schemas and views of those that stay registered.
void LoadExtensionPackages();
// Forgets every registered package.
void ClearExtensionPackages();

}  // namespace ovrametadata
