// The entry points a host environment calls when it loads and unloads the library.
//
//   HXInitialize_kiv();   // once, before any other call: builds and registers kiv's metamodel
//   ...
//   HXTerminate_kiv();    // once, at the end: unregisters it
//
// Both may be called again: a second initialisation without a termination in between
// does nothing, and termination without initialisation does nothing. Elements and models
// made meanwhile stay valid after termination, but documents naming kiv's classes can no
// longer be read.
#pragma once

extern "C" {
void HXInitialize_kiv();
void HXTerminate_kiv();
}
