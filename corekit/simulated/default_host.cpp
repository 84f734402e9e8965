#include "corekit/simulated/default_host.h"

namespace {

constexpr char TEXT[] =
    R"(# A small host on which every section of a report has something to show, on a day in which something is wrong:
# db1 is bound to a pcpu that has too little time for it, and drops what comes while it waits; what backup1 sends leaves
# by one queue of nic1. What lines leave out follows from the others: traffic of uplinks and stack, load of the pcpus.
host name=simulated-host pcpus=8 packages=2 cores=4 llc=2 uptime=7384 load=wave

vm web1 leader=1201 vcpus=4 used=310 ready=21 costop=3
vm db1 leader=1202 vcpus=2 used=640 ready=5 costop=12 pcpu=3 load=constant
vm mail1 leader=1301 vcpus=1 used=45 ready=2 load=burst
vm backup1 leader=1302 vcpus=2 used=420 ready=9 costop=1 load=constant

switch vSwitch0
uplink switch=vSwitch0 port=33554434 nic=nic0 device="0000:04:00.0" txqueues=4 rxqueues=4 filters=1,2,0,1
hostnic switch=vSwitch0 port=33554436 name=host0 tx=4000 rx=5200 size=410
plain switch=vSwitch0 port=33554433 type=0 client=management
plain switch=vSwitch0 port=33554435 type=1 client=internal
vnic switch=vSwitch0 port=50331650 vm=web1 model=parlan3 scheme=1 tx=24000 rx=32000 size=900
vnic switch=vSwitch0 port=50331651 vm=db1 model=parlan3 scheme=2 tx=9000 rx=11000 size=640 rxerrors=140

switch vSwitch1
uplink switch=vSwitch1 port=67108866 nic=nic1 device="0000:04:00.1" txqueues=4 first=930 rxqueues=3 filters=2,1,3
hostnic switch=vSwitch1 port=67108868 name=host1 tx=800 rx=900 size=256
plain switch=vSwitch1 port=67108865 type=10 client=management
plain switch=vSwitch1 port=67108867 type=2 client=mirror
vnic switch=vSwitch1 port=83886082 vm=mail1 model=3 scheme=7 tx=450 rx=520 size=300
vnic switch=vSwitch1 port=83886083 vm=web1 model=parlan2 scheme=1 tx=2200 rx=2600 size=480
vnic switch=vSwitch1 port=83886084 vm=backup1 model=parlan3 scheme=0 tx=118000 rx=9100 size=1460

# Names with more digits behind, and backups, belong to somebody else.
worldlet nic0-tx-0 used=120 ready=6 pcpu=0
worldlet nic0-rx-0 used=150 ready=8 pcpu=0
worldlet nic0-rx-backup pcpu=4
worldlet nic1-tx-0 used=210 ready=9 pcpu=1 load=constant
worldlet nic1-rx-0 used=45 ready=2 worldlet=nic1-tx-0
worldlet nic10-tx-0 used=11 ready=1 pcpu=6
worldlet host0-rx used=18 ready=1 pcpu=1
worldlet host1-rx used=4 pcpu=7
worldlet NetWdt-Async-1201 used=82 ready=4 vcpu=web1/0
worldlet NetWdt-Async-12010 used=9 ready=1 pcpu=5
worldlet NetWdt-Async-1201-backup pcpu=1
worldlet NetWdt-Async-1202 used=41 ready=3 pcpu=3 load=constant
worldlet NetWdt-Async-1301 used=6 worldlet=nic0-rx-0 load=burst
worldlet NetWdt-Async-1302 used=160 ready=2 pcpu=2 load=constant

vector 32 names= rate=100 time=250
vector 64 names=nic0-tx rate=5300 time=13600
vector 65 names=nic0-rx rate=8100 time=25100
vector 66 names=nic1,timer rate=17300 time=61000 load=constant
vector 67 names=nic10 rate=900 time=2100
vector 4294967364 names=nic1-rx rate=2400 time=7200
)";

}  // namespace

const char *DefaultHostText() {
    return TEXT;
}
