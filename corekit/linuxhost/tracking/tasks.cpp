#include "corekit/linuxhost/tracking/part.h"

#include <unistd.h>

namespace {

constexpr size_t BATCH = 512;  // rows of one read; the kernel has room for as many

int LinkOf(const Tracking &tracking, u32 pid) {
    bpf_iter_link_info info = {};
    info.task.pid = pid;
    bpf_attr attributes = {};
    attributes.link_create.prog_fd = static_cast<u32>(tracking.groups[TRACKING_TASKS].programs.programs[0]);
    attributes.link_create.attach_type = BPF_TRACE_ITER;
    attributes.link_create.iter_info = reinterpret_cast<u64>(&info);
    attributes.link_create.iter_info_len = sizeof info;
    return Bpf(BPF_LINK_CREATE, &attributes);
}

int Iterator(int link) {
    bpf_attr attributes = {};
    attributes.iter_create.link_fd = static_cast<u32>(link);
    return Bpf(BPF_ITER_CREATE, &attributes);
}

// 0 at the end, or a negative errno. The kernel gives whole rows.
int ReadAll(int iterator, std::vector<TaskSamples> *rows) {
    while (true) {
        size_t had = rows->size();
        rows->resize(had + BATCH);
        ssize_t length = read(iterator, rows->data() + had, BATCH * sizeof(TaskSamples));
        int error = length < 0 ? errno : 0;
        rows->resize(had + (length > 0 ? static_cast<size_t>(length) / sizeof(TaskSamples) : 0));
        if (length <= 0 && error != EAGAIN && error != EINTR) {
            return -error;
        }
    }
}

}  // namespace

Outcome TasksRead(Tracking *tracking, u32 pid, const TaskSamples **rows, u32 *count) {
    if (Outcome outcome = GroupNeed(tracking, TRACKING_TASKS); outcome != FINE) {
        return outcome;
    }
    tracking->tasks.clear();
    int link = LinkOf(*tracking, pid);
    int iterator = link >= 0 ? Iterator(link) : link;
    int error = iterator >= 0 ? ReadAll(iterator, &tracking->tasks) : iterator;
    for (int descriptor : {link, iterator}) {
        if (descriptor >= 0) {
            close(descriptor);
        }
    }
    *rows = tracking->tasks.data();
    *count = static_cast<u32>(tracking->tasks.size());
    return error == 0 ? FINE : FailWith(tracking, error, "threads");
}

void TasksEnd(Tracking *tracking) {
    GroupClose(tracking, TRACKING_TASKS);
}
