// State of the exported interface shared by its source files.
#ifndef LUMICOR_INTERFACE_LMC_STATE_H
#define LUMICOR_INTERFACE_LMC_STATE_H

namespace lmc {

// True between a successful LmcInitializeLumicor and LmcFinalizeLumicor.
bool IsInitialized();

}  // namespace lmc

#endif
