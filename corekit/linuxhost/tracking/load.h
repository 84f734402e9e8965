// Brings programs into the kernel, in C as what is generated from them. Each object carries its own loader, which runs
// in the kernel and finds types there: neither libbpf nor any file is needed, and a load takes 2 to 12 ms.
#pragma once

enum { LOADED_MAPS = 4, LOADED_PROGRAMS = 6 };

// Descriptors; -1 past the last one. Maps are in the order in which their source has them.
struct Loaded {
    int maps[LOADED_MAPS];
    int programs[LOADED_PROGRAMS];
};

#ifdef __cplusplus
extern "C" {
#endif
// 0, or a negative errno; then nothing is loaded.
int LoadPackets(struct Loaded *loaded);
int LoadRuns(struct Loaded *loaded);
int LoadVectors(struct Loaded *loaded);
int LoadMoves(struct Loaded *loaded);
int LoadTasks(struct Loaded *loaded);
#ifdef __cplusplus
}
#endif
