#include "corekit/simulated/default_host.h"

namespace {

constexpr char TEXT[] = R"(# A small host on which every section of a report has something to show.
host name=labhost pcpus=8 packages=2 cores=4 llc=2
pcpu 0 busy=640 worldlet=220
pcpu 1 busy=410 worldlet=120
pcpu 2..5 busy=230 worldlet=45
pcpu 6..7 busy=80 worldlet=5
self used=2
stack tx=4000 rx=6000

vm web1 leader=1201 vcpus=4 used=310 ready=21 costop=3
vm db1 leader=1202 vcpus=2 used=640 ready=55 costop=12
vm mail1 leader=1301 vcpus=1 used=45 ready=2 costop=0
vm backup1 leader=1302 vcpus=2 used=120 ready=9 costop=1

switch vSwitch0
uplink switch=vSwitch0 port=33554434 nic=nic0 device="0000:04:00.0" txqueues=4 rxqueues=4 filters=1,2,0,1 tx=48000 rx=64000 size=820 errors=2
hostnic switch=vSwitch0 port=33554436 name=host0 tx=4000 rx=5200 size=410
plain switch=vSwitch0 port=33554433 type=0 client=management
plain switch=vSwitch0 port=33554435 type=1 client=internal
vnic switch=vSwitch0 port=50331650 vm=web1 model=parlan3 scheme=1 tx=24000 rx=32000 size=900 errors=1
vnic switch=vSwitch0 port=50331651 vm=db1 model=parlan2 scheme=2 tx=9000 rx=11000 size=640 errors=1
vnic switch=vSwitch0 port=50331652 vm=backup1 model=parlan3 scheme=0 tx=14000 rx=1200 size=1460

switch vSwitch1
uplink switch=vSwitch1 port=67108866 nic=nic1 device="0000:04:00.1" txqueues=2 rxqueues=3 filters=2,1,3 tx=6200 rx=7400 size=512
hostnic switch=vSwitch1 port=67108868 name=host1 tx=800 rx=900 size=256
plain switch=vSwitch1 port=67108865 type=10 client=management
plain switch=vSwitch1 port=67108867 type=2 client=mirror
vnic switch=vSwitch1 port=83886082 vm=mail1 model=3 scheme=7 tx=450 rx=520 size=300
vnic switch=vSwitch1 port=83886083 vm=web1 model=parlan2 scheme=1 tx=2200 rx=2600 size=480

# Names with more digits behind, and backups, belong to somebody else.
worldlet NetWdt-Async-1201 used=82 ready=4 wait=914 vcpu=10001
worldlet NetWdt-Async-12010 used=9 ready=1 wait=990 pcpu=5
worldlet NetWdt-Async-1201-backup used=0 ready=0 wait=1000 pcpu=1
worldlet NetWdt-Async-1202 used=41 ready=3 wait=956 pcpu=2
worldlet NetWdt-Async-1301 used=6 ready=0 wait=994 worldlet=7
worldlet NetWdt-Async-1302 used=25 ready=2 wait=973 pcpu=3
worldlet nic0-tx-0 used=120 ready=6 wait=874 pcpu=0
worldlet nic0-rx-0 used=150 ready=8 wait=842 pcpu=0
worldlet nic0-rx-backup used=0 ready=0 wait=1000 pcpu=4
worldlet nic1-tx-0 used=30 ready=2 wait=968 pcpu=1
worldlet nic1-rx-0 used=45 ready=2 wait=953 worldlet=3
worldlet nic10-tx-0 used=11 ready=1 wait=988 pcpu=6
worldlet host0-rx used=18 ready=1 wait=981 pcpu=1
worldlet host1-rx used=4 ready=0 wait=996 pcpu=7

vector 32 names= rate=100 time=250
vector 64 names=nic0-tx rate=8200 time=21000
vector 65 names=nic0-rx rate=12600 time=39000
vector 66 names=nic1,timer rate=3100 time=7700
vector 67 names=nic10 rate=900 time=2100
vector 4294967364 names=nic1-rx rate=2400 time=5200
)";

}  // namespace

const char *DefaultHostText() {
    return TEXT;
}
