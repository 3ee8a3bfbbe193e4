"""The test machines: what QEMU is told of each (docs/machines.md says what each is there for)."""


def networks(*devices):
    """Network cards, each on a network of its own: "NAME[,OPTION...]"."""
    words = []
    for number, device in enumerate(devices):
        words += ['-netdev', f'user,id=n{number},restrict=on']
        words += ['-device', f'{device},netdev=n{number},mac=52:54:00:00:00:{number:02x}']
    return words


def disks(*devices):
    """Disks of nothing, a MiB each."""
    words = []
    for number, device in enumerate(devices):
        words += ['-drive', f'if=none,id=d{number},driver=null-co,size=1M,read-zeroes=on']
        words += ['-device', f'{device},drive=d{number}']
    return words


BOOT_LOADER = ('BOOT_IMAGE=/boot/vmlinuz-cloud root=/dev/vda1 ro audit=1 fsck.mode=force '
               'BOOTIF=01-52-54-00-00-00-01 console=ttyS0 panic=-1 quiet')

# name: architecture, the kernel's command line, QEMU.
# With "overlay" on its command line a machine's root lies in memory over an archive.
MACHINES = {
    'pc': ('amd64', 'console=ttyS0 panic=-1 quiet',
           ['-M', 'pc', '-smp', '1', '-vga', 'std'] + networks('e1000') + disks('ide-hd')),
    'q35-bridges': ('amd64', BOOT_LOADER + ' overlay',
                    ['-M', 'q35', '-smp', '4', '-vga', 'std',
                     '-device', 'pcie-root-port,id=r1,chassis=1,slot=1,addr=4.0,multifunction=on',
                     '-device', 'pcie-root-port,id=r2,chassis=2,slot=2,addr=4.1',
                     '-device', 'pcie-root-port,id=r3,chassis=3,slot=3,addr=5',
                     '-device', 'x3130-upstream,id=u1,bus=r3',
                     '-device', 'xio3130-downstream,id=s1,bus=u1,chassis=4,slot=4',
                     '-device', 'pcie-pci-bridge,id=p1,bus=s1',
                     '-device', 'virtio-scsi-pci,bus=r2'] +
                    networks('virtio-net-pci,bus=r1', 'e1000,bus=p1,addr=1') +
                    disks('nvme,serial=n1,addr=6', 'scsi-hd')),
    'arm64': ('arm64', 'console=ttyAMA0 panic=-1 quiet',
              ['-M', 'virt', '-cpu', 'cortex-a57', '-smp', '2',
               '-device', 'pcie-root-port,id=r1,chassis=1,slot=1,addr=4'] +
              networks('virtio-net-pci,bus=r1') + disks('nvme,serial=n1')),
}
