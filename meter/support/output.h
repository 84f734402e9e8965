// Descriptors that somebody else reads: standard error and the report's.
#pragma once

// Waits until a write to the descriptor would go through, and gives true; false when a termination signal came and it
// would not. A signal between a look at the flag and a write that blocks could not end that write, so the waiting is
// done here, in slices, and writes follow only where there is room. True at once in replay, where signals have their
// default action and the write may just as well wait by itself.
bool OutputReady(int fd);
