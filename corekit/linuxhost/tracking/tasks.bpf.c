// Writes one record for each thread that is walked over.
#include "corekit/linuxhost/tracking/records.h"

#include <bpf/bpf_core_read.h>
#include <bpf/bpf_helpers.h>

char LICENSE[] SEC("license") = "Dual BSD/GPL";

SEC("iter/task")
int Walk(struct bpf_iter__task *ctx) {
    const struct task_struct *task = ctx->task;
    if (task == 0) {
        return 0;
    }
    struct TaskSamples row = {};
    row.tid = (__u32)task->pid;
    row.pid = (__u32)task->tgid;
    row.born = task->start_boottime;
    row.run = task->se.sum_exec_runtime;
    row.migrations = task->se.nr_migrations;
    if (bpf_core_field_exists(task->sched_info.run_delay)) {
        row.known |= TASK_READY;
        row.ready = task->sched_info.run_delay;
        row.runs = task->sched_info.pcount;
    }
    if (bpf_core_field_exists(task->stats.nr_wakeups_remote)) {
        row.known |= TASK_REMOTE_WAKEUPS;
        row.remoteWakeups = task->stats.nr_wakeups_remote;
    }
    bpf_seq_write(ctx->meta->seq, &row, sizeof row);
    return 0;
}
