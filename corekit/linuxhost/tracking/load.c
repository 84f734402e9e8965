#include "corekit/linuxhost/tracking/load.h"

#include "corekit/linuxhost/tracking/records.h"

#include <errno.h>
#include <linux/bpf.h>
#include <moves.lskel.h>
#include <packets.lskel.h>
#include <runs.lskel.h>
#include <tasks.lskel.h>
#include <vectors.lskel.h>

// Takes the descriptors out of what is about to be destroyed.
static void Take(struct Loaded *loaded, struct bpf_map_desc *maps, unsigned long numMaps,
                 struct bpf_prog_desc *programs, unsigned long numPrograms) {
    for (unsigned long i = 0; i < LOADED_MAPS; i++) {
        loaded->maps[i] = i < numMaps ? maps[i].map_fd : -1;
    }
    for (unsigned long i = 0; i < LOADED_PROGRAMS; i++) {
        loaded->programs[i] = i < numPrograms ? programs[i].prog_fd : -1;
    }
    for (unsigned long i = 0; i < numMaps; i++) {
        maps[i].map_fd = 0;
    }
    for (unsigned long i = 0; i < numPrograms; i++) {
        programs[i].prog_fd = 0;
    }
}

#define COUNT(member, type) (sizeof(member) / sizeof(type))
#define LOAD(Name, object, maps, numMaps)                                                                              \
    int Name(struct Loaded *loaded) {                                                                                  \
        struct object *skeleton = object##__open();                                                                    \
        int error = skeleton != NULL ? object##__load(skeleton) : -ENOMEM;                                             \
        if (error == 0) {                                                                                              \
            unsigned long programs = COUNT(skeleton->progs, struct bpf_prog_desc);                                     \
            Take(loaded, (struct bpf_map_desc *)(maps), numMaps, (struct bpf_prog_desc *)&skeleton->progs, programs);  \
        }                                                                                                              \
        object##__destroy(skeleton);                                                                                   \
        return error;                                                                                                  \
    }
#define LOAD_WITH_MAPS(Name, object) LOAD(Name, object, &skeleton->maps, COUNT(skeleton->maps, struct bpf_map_desc))

LOAD_WITH_MAPS(LoadPackets, packets)
LOAD_WITH_MAPS(LoadRuns, runs)
LOAD_WITH_MAPS(LoadVectors, vectors)
LOAD_WITH_MAPS(LoadMoves, moves)
LOAD(LoadTasks, tasks, NULL, 0)
