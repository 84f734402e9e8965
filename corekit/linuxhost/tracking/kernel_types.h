// The kernel's types as far as the programs read them. Only the names count: the loader finds where each field stands
// in the running kernel, so that one build fits all.
#pragma once

typedef unsigned char __u8;
typedef unsigned short __u16;
typedef unsigned int __u32;
typedef unsigned long long __u64;
typedef int __s32;
typedef long long __s64;
typedef __u16 __be16;
typedef __u32 __be32;
typedef __u32 __wsum;
typedef _Bool bool;

enum {
    BPF_MAP_TYPE_HASH = 1,
    BPF_MAP_TYPE_ARRAY = 2,
    BPF_MAP_TYPE_PERCPU_HASH = 5,
    BPF_F_NO_PREALLOC = 1,
    BPF_F_MMAPABLE = 1024
};

#pragma clang attribute push(__attribute__((preserve_access_index)), apply_to = record)

struct ns_common {
    unsigned int inum;
};
struct net {
    struct ns_common ns;
};
typedef struct {
    struct net *net;
} possible_net_t;
struct net_device {
    int ifindex;
    possible_net_t nd_net;
};
struct sk_buff {
    struct net_device *dev;
    unsigned int len;
    unsigned char *head;
    unsigned char *data;
    __u16 mac_header;
};

struct irqaction {
    struct irqaction *next;
};

struct thread_info {
    __u32 cpu;
};
struct sched_entity {
    __u64 sum_exec_runtime;
    __u64 nr_migrations;
};
struct sched_info {
    unsigned long pcount;
    unsigned long long run_delay;
};
struct sched_statistics {
    __u64 nr_wakeups_remote;
};
struct task_struct {
    struct thread_info thread_info;
    unsigned int __state;
    int pid;
    int tgid;
    __u64 start_boottime;
    struct sched_entity se;
    struct sched_info sched_info;
    struct sched_statistics stats;
};

struct seq_file;
struct bpf_iter_meta {
    struct seq_file *seq;
};
struct bpf_iter__task {
    struct bpf_iter_meta *meta;
    struct task_struct *task;
};

#pragma clang attribute pop
