"""Whether the tools agreed with their peers on a machine, and whether the recording says the same.

What init kept of a run is in folders: before and after (every command of the list, around the
recording), first and last (what /proc and the peers said around all that), and the rest.
"""
import os
import re
import subprocess


class Machine:
    """What a machine handed out."""

    def __init__(self, folder):
        self.folder = folder
        self.faults = []

    def read(self, path):
        with open(f'{self.folder}/{path}', 'rb') as file:
            return file.read()

    def text(self, path):
        return self.read(path).decode('utf-8', 'replace')

    def lines(self, path):
        return self.text(path).splitlines()

    def names(self, path):
        return sorted(os.listdir(f'{self.folder}/{path}'))

    def expect(self, ours, theirs, what):
        if ours != theirs:
            self.faults.append(f'{what}:\n    ours   {short(ours)}\n    theirs {short(theirs)}')

    def expect_that(self, holds, what):
        if not holds:
            self.faults.append(what)


def short(value):
    text = repr(value)
    return text if len(text) < 700 else text[:700] + '...'


def differing(ours, theirs):
    """The lines that only one of two lists has, so that a fault can be read."""
    return [line for line in ours if line not in theirs], \
           [line for line in theirs if line not in ours]


class Outputs:
    """The commands of the list and what each said, by their text."""

    def __init__(self, machine, commands):
        self.machine = machine
        self.number = {command: index + 1 for index, command in enumerate(commands)}

    def out(self, command, stage='before'):
        return self.machine.text(f'{stage}/{self.number[command]}.out')

    def lines(self, command, stage='before'):
        return self.out(command, stage).splitlines()

    def status(self, command, stage='before'):
        return int(self.machine.text(f'{stage}/{self.number[command]}.status'))


# PCI.

def judge_pci_names(machine, outputs):
    """pciutils names the subclass, which is what -v adds; where the file has no name it makes one
    up, and where it has none of a subclass it takes that of the class."""
    ours = [line for line in outputs.lines('lspci -v') if line and line[0] != '\t']
    theirs = machine.lines('peers/lspci_names.out')
    machine.expect(len(ours), len(theirs), 'functions with names')
    for mine, line in zip(ours, theirs):
        address, fields = line.split(' ', 1)[0], re.findall(r'"([^"]*)"', line)
        kind = ' :' if '[' in fields[0] else fields[0] + ' '
        named = not fields[2].startswith('Device ')
        names = f': {fields[1]} ' if named else ':   '
        machine.expect_that(mine.startswith(f'{address} {kind}') and names in mine,
                            f'names: {mine} / {line}')


def judge_pci_numbers(machine, outputs):
    theirs = []
    for line in machine.lines('peers/lspci_numbers.out'):
        address, kind, numbers = line.split(' ')[:3]
        theirs.append(f'{address} Class {kind} {numbers} ')
    ours = [line.split('[')[0] for line in outputs.lines('lspci -n')]
    machine.expect(ours, theirs, 'lspci -n')
    machine.expect_that(len(ours) >= 4, 'the machine has hardly any functions')


def addresses_and_bytes(lines):
    return [line if re.match(r'[0-9a-f]{2,3}: ', line) else line.split(' ')[0]
            for line in lines if line]


def judge_pci_dumps(machine, outputs):
    machine.expect(addresses_and_bytes(outputs.lines('lspci -nd')),
                   addresses_and_bytes(machine.lines('peers/lspci_dump.out')), 'lspci -nd')
    # Ours ends with the first function that has no extended space; pciutils goes on with a short
    # one.
    ours = addresses_and_bytes(outputs.lines('lspci -ne'))
    theirs = addresses_and_bytes(machine.lines('peers/lspci_extended.out'))
    machine.expect(ours, theirs[:len(ours)], 'lspci -ne')
    for address in machine.names('config'):
        config = machine.read(f'config/{address}')
        machine.expect(machine.read(f'pci-info/{address}.out'), config[:256], f'{address} -c')
        extended = config if len(config) == 4096 else b''
        machine.expect(machine.read(f'pci-info/{address}.extended.out'), extended, f'{address} -e')


def judge_pci_modules(machine, outputs):
    """A driver's module has the driver's name, with other hyphens, or is one that pciutils
    lists."""
    theirs = {}
    for line in machine.lines('peers/lspci_drivers.out'):
        if not line.startswith('\t'):
            address = line.split(' ')[0]
            theirs[address] = ['', '']
        elif line.startswith('\tKernel driver in use: '):
            theirs[address][0] = line.split(': ')[1]
        elif line.startswith('\tKernel modules: '):
            theirs[address][1] = line.split(': ')[1]
    ours = {line[:12]: line[50:62].strip() for line in outputs.lines('lspci -p')[2:]
            if line[0] != ' '}
    machine.expect(sorted(ours), sorted(theirs), 'lspci -p')
    for address, module in ours.items():
        driver, modules = theirs.get(address, ['', ''])
        agrees = module.replace('_', '-') == driver.replace('_', '-') or \
            (driver != '' and module in modules.split(', '))
        machine.expect_that(agrees, f'module of {address}: {module} / {driver} of {modules}')


# Platform.

def judge_interrupts(machine, outputs):
    """The same numbers, and counts between those that /proc said before and after."""
    def table(stage):
        rows = {}
        cpus = len(machine.lines(f'{stage}/interrupts')[0].split())
        for line in machine.lines(f'{stage}/interrupts')[1:]:
            words = line.split()
            if words[0][:-1].isdigit():
                rows[int(words[0][:-1])] = ([int(word) for word in words[1:1 + cpus]], line)
        return rows
    first, last = table('first'), table('last')
    ours = {}
    for line in outputs.lines('irqinfo')[1:]:
        cookie, rest = line.split(':', 1)
        ours[int(cookie, 16)] = rest
    machine.expect(sorted(ours), sorted(first), 'irqinfo')
    for number, rest in ours.items():
        if number not in first or number not in last:
            continue
        low, high = first[number][0], last[number][0]
        counts = [int(word) for word in rest.split()[:len(low)]]
        machine.expect_that(all(a <= b <= c for a, b, c in zip(low, counts, high)),
                            f'interrupt {number}: {low} <= {counts} <= {high}')
        for name in re.findall(r'ZLK ([^,]+)', rest):
            machine.expect_that(name in first[number][1], f'interrupt {number}: {name}')


def judge_acpi(machine, _):
    tables = [name for name in machine.names('tables')
              if os.path.isfile(f'{machine.folder}/tables/{name}')]
    dumped = machine.names('aml')
    machine.expect(len(dumped), len(tables), 'ACPI tables')
    theirs = sorted((name[:4], machine.read(f'tables/{name}')) for name in tables)
    ours = sorted((name[:4], machine.read(f'aml/{name}')) for name in dumped)
    machine.expect_that(ours == theirs, f'bytes of the ACPI tables: {dumped} / {tables}')


def judge_boot(machine, outputs):
    line = machine.text('peers/cmdline.out').strip()
    words = line.split(' ')
    kernel, options = 'vmlinuz-' + machine.text('peers/uname.out').split()[2], line
    if words[0].startswith('BOOT_IMAGE='):
        kernel, options = words[0][len('BOOT_IMAGE='):], ' '.join(words[1:])
    machine.expect(outputs.out('bootOption -rko'), f'{kernel}\n{options}\n', 'bootOption -rko')
    flags = ['fsck.mode=force' in words, 'audit=1' in words, False, 'BOOTIF=' in line]
    values = [label.split(' : ')[1] for label in outputs.lines('bootOption -afip')]
    machine.expect(values, [str(int(flag)) for flag in flags], 'bootOption -afip')
    machine.expect(outputs.out('bootOption -m'),
                   'Modules : ' + '/run/archive ' * ('overlay' in words) + '\n', 'bootOption -m')
    machine.expect(outputs.out('bootOption -b'), 'Boot Option Files : /etc/kernel/cmdline \n',
                   'bootOption -b')
    machine.expect(machine.text('peers/boot_files.out').strip(), 'root=/dev/vda ro quiet',
                   'bootOption -rC')
    system = machine.text('peers/uname.out').split()
    build = int(re.match(r'\d+', system[3][1:]).group())
    machine.expect(outputs.out('zelvar -v'), f'{system[0]} {system[2]} build-{build:05}\n',
                   'zelvar -v')


def judge_clocks(machine, outputs):
    """The emulated clock stood at noon of a leap day when the machine began; it is set and read
    back by us and by busybox."""
    clock = outputs.out('hwclock')
    if '0xbad0003' not in clock or machine.text('first/busybox_hwclock.status').strip() == '0':
        machine.expect_that(re.match(r'12:\d\d:\d\d   02/29/2024   UTC\n$', clock),
                            f'clock: {clock}')
        machine.expect(machine.text('clock/set.out'),
                       'Clock updated.\nTime: 23:58:07   Date: 02/28/2031   UTC\n', 'clock set')
        theirs = machine.text('clock/busybox.out')
        machine.expect_that(re.match(r'Fri Feb 28 23:58:\d\d 2031', theirs), f'clock: {theirs}')
        ours = machine.text('clock/ours.out')
        machine.expect_that(re.match(r'23:58:\d\d   02/28/2031   UTC', ours), f'clock: {ours}')
    up = [float(machine.lines(f'{stage}/uptime')[0].split()[0]) for stage in ('first', 'last')]
    days, hours, minutes, seconds = re.search(r'up (?:(\d+) days, )?(\d+):(\d+):(\d+),',
                                              outputs.out('uptime')).groups()
    ours = int(days or 0) * 86400 + int(hours) * 3600 + int(minutes) * 60 + int(seconds)
    machine.expect_that(int(up[0]) <= ours <= up[1], f'uptime: {ours} not in {up}')
    cpus = int(machine.text('peers/cpus.out'))
    machine.expect(len(re.findall('PCPU', outputs.lines('irqinfo')[0])), cpus, 'CPUs')


# Worlds.

class Process:
    def __init__(self, line):
        number, stat, self.command, namespace = line.split('|')
        self.id = int(number)
        self.name = stat[stat.index('(') + 1:stat.rindex(')')]
        rest = stat[stat.rindex(')') + 2:].split()
        self.state, self.parent, self.group, self.session = rest[0], *map(int, rest[1:4])
        self.namespace = namespace


def processes(machine, stage):
    """The processes by ID, those without a program (kernel threads, zombies) left out."""
    lines = machine.lines(f'{stage}/processes')
    return {int(line.split('|')[0]): Process(line) for line in lines if '(' in line}


def stable_processes(machine):
    first, last = processes(machine, 'first'), processes(machine, 'last')
    return {number: process for number, process in first.items()
            if number in last and last[number].name == process.name}


def judge_worlds(machine, outputs):
    peers = stable_processes(machine)
    machine.expect_that(len(peers) >= 12, f'only {len(peers)} processes')
    ours = {}
    for line in outputs.lines('ps -usTtcU')[1:]:
        words = line.split()
        if words:
            ours[int(words[0])] = words
    for number, process in peers.items():
        words = ours.get(number)
        machine.expect_that(words is not None, f'ps lacks {number} {process.name}')
        if words is None:
            continue
        machine.expect([words[1], words[2]], [str(number), process.name], f'ps of {number}')
        machine.expect(words[4], {'S': 'SLEEP', 'R': 'RUN', 'D': 'DISK'}.get(process.state),
                       f'state of {number}')
        machine.expect(' '.join(words[9:]), ' '.join(process.command.split()),
                       f'command of {number}')
    groups = {int(line.split()[0]): line.split()[-2:]
              for line in outputs.lines('ps -Cgj')[1:] if line.split()}
    for number, process in peers.items():
        machine.expect(groups.get(number), [str(process.group), str(process.session)],
                       f'groups of {number}')
    judge_userspaces(machine, ours, peers)


def judge_userspaces(machine, ours, peers):
    """Processes are in one userspace where they are in one PID namespace; the reader's is 1."""
    numbers = {}
    for number, process in peers.items():
        if number in ours:
            numbers.setdefault(process.namespace, set()).add(int(ours[number][8]))
    machine.expect(sorted(min(values) for values in numbers.values()),
                   list(range(1, len(numbers) + 1)), 'userspaces')
    machine.expect_that(all(len(values) == 1 for values in numbers.values()), f'mixed: {numbers}')
    machine.expect(numbers.get(peers[1].namespace), {1}, "init's userspace")
    asked = machine.lines('peers/userspaces')
    machine.expect_that(len(asked) >= len(peers), f'only {len(asked)} userspaces')
    for line in asked:
        number, userspace = map(int, line.split()[:2])
        if number in ours:
            machine.expect(userspace, int(ours[number][8]), f'userspaceof {number}')


def judge_zombies(machine, outputs):
    """Those that hang under a world that /proc shows to have such a child."""
    zombies = {int(line.split()[0]) for line in outputs.lines('ps -z') if '<zombie>' in line}
    parents = {number for number, process in stable_processes(machine).items()
               if re.search(r'^sleep 1000[123]', process.command)}
    machine.expect_that(len(parents) == 3 and len(zombies) >= 3,
                        f'zombies {zombies} of {parents}')


def judge_matching(machine, outputs):
    def numbers(text):
        return sorted(map(int, re.findall(r'\d+', text)))
    # The peer also gives zombies, which are no cartels.
    alive = processes(machine, 'first')
    machine.expect(numbers(outputs.out('pidof sleep')),
                   [number for number in numbers(machine.text('peers/pidof.out'))
                    if number in alive], 'pidof sleep')
    listed = {int(line.split()[0]): line.split()[1] for line in outputs.lines('pgrep -l .')}
    for number, process in stable_processes(machine).items():
        machine.expect(listed.get(number), process.command.split()[0], f'pgrep of {number}')
    machine.expect(numbers(outputs.out('pgrep -f archive')),
                   sorted(number for number, process in stable_processes(machine).items()
                          if 'archive' in process.command), 'pgrep -f archive')


def judge_descriptors(machine, outputs):
    """Files by their paths; of what else a descriptor can be, that it is there."""
    def table(stage):
        links = {}
        for line in machine.lines(f'{stage}/descriptors'):
            path, _, target = line.partition(' ')
            _, _, number, _, descriptor = path.split('/')
            links[int(number), int(descriptor)] = target
        return links
    first, last = table('first'), table('last')
    ours = {}
    for line in outputs.lines('lsof')[2:]:
        words = line.split()
        if words[2] != 'MMAP':
            ours[int(words[0]), int(words[3])] = ' '.join(words[4:])
    for key, target in first.items():
        if key[0] == 1 or last.get(key) != target or not target:
            continue
        machine.expect_that(key in ours, f'lsof lacks {key} {target}')
        if target.startswith('/'):
            machine.expect(ours.get(key), target, f'descriptor {key}')
    machine.expect_that(any('(deleted)' in target for target in ours.values()),
                        'no deleted file is open')
    machine.expect_that(any(re.search('TCP.*7000', target) for target in ours.values()),
                        'nothing listens on port 7000')


def judge_signals(machine, _):
    def named(path):
        return sorted(line.split()[1] for line in machine.lines(path))
    dreamers = ['first', 'second', 'third']
    machine.expect(named('signals/all.out'), [f'/tmp/busybox-{name}' for name in dreamers],
                   'sleepers after a probe')
    machine.expect(named('signals/left.out'), ['/tmp/busybox-third'], 'sleepers left')
    machine.expect(named('signals/none.out'), [], 'sleepers at the end')
    ends = [machine.text(f'signals/{name}.ended').strip() for name in dreamers]
    machine.expect(ends, ['129', '143', '137'], 'what ended the sleepers')


# File systems.

def judge_volumes(machine, outputs):
    rows = {}
    for line in outputs.lines('mdf'):
        match = re.match(r'(/.*?) +(\d+) +(\d+)(?: +(\d+) +(\d+)% --)?$', line)
        if match:
            rows[match[1]] = [int(word) for word in match.groups()[1:] if word]
    for line in machine.lines('peers/df.out')[1:]:
        words = line.split()
        blocks, used, available = map(int, words[1:4])
        archive = words[5] == '/mnt/archive'
        machine.expect(rows.get(words[5], [])[:3],
                       [(blocks + 3) // 4 * 4, used] if archive else [blocks, used, available],
                       f'mdf of {words[5]}')
    machine.expect(re.findall(r' (/\S+): +(\d+)', machine.text('peers/unlinked.out')),
                   [('/mnt/ram/gone', str(len('held\n')))], 'mdu -u')


# The recording.

# The recording has kifcache itself among the processes.
OF_PROCESSES = ('ps', 'pidof', 'pgrep', 'lsof')
# Threads of the kernel that change their names, and what the scene redirects.
BUSY = rb'kworker/|^1 init (FILE|CHAR|PIPE)'


def run_outside(release, arguments, host='none'):
    environment = {'PATH': '/usr/bin:/bin', 'TZ': 'UTC', 'ZELLIBS_HOST': host}
    return subprocess.run([f'{release}/bin/zlkkiftools', *arguments], env=environment,
                          stdin=subprocess.DEVNULL, capture_output=True, check=False)


def squeezed(output):
    """The lines; how wide a column is depends on what moved."""
    return [b' '.join(line.split()) for line in output.splitlines()]


def is_in_order(lines, others):
    rest = iter(others)
    return all(line in rest for line in lines)


def judge_recording(machine, release, commands):
    """What a command said alike before and after the recording is said by the recording, in the
    same order; where nothing moved, to the byte."""
    file = f'{machine.folder}/machine.kif'
    checked = subprocess.run([f'{release}/bin/kifcache', 'check', file], capture_output=True,
                             check=False)
    machine.expect(checked.returncode, 0, 'kifcache check')
    for number, command in enumerate(commands, 1):
        outside = run_outside(release, ['-c', file, *command.split()])
        before, after = (machine.read(f'{stage}/{number}.out') for stage in ('before', 'after'))
        message = machine.read(f'before/{number}.err')
        machine.expect(outside.returncode, int(machine.text(f'before/{number}.status')),
                       f'status of {command} outside')
        machine.expect(outside.stderr, message, f'messages of {command} outside')
        if before == after and command.split()[0] not in OF_PROCESSES:
            if outside.stdout != before:
                ours, theirs = differing(outside.stdout.splitlines(), before.splitlines())
                machine.expect(ours, theirs, f'{command} outside')
            continue
        later = set(squeezed(after))
        stable = [line for line in squeezed(before)
                  if line in later and not re.search(BUSY, line)]
        missing = [line for line in stable if line not in squeezed(outside.stdout)]
        machine.expect_that(is_in_order(stable, squeezed(outside.stdout)),
                            f'{command} outside lacks {short(missing)}')
    served = run_outside(release, ['bootOption', '-rC'], host=file)
    machine.expect(served.stdout, machine.read('peers/boot_files.out'), 'boot option files outside')


def judge(folder, release, command_line):
    """What is wrong: one text a fault."""
    machine = Machine(folder)
    with open(f'{os.path.dirname(os.path.abspath(__file__))}/commands') as file:
        commands = file.read().splitlines()
    outputs = Outputs(machine, commands)
    machine.expect(machine.text('peers/cmdline.out').strip(), command_line, 'kernel command line')
    for check in (judge_pci_names, judge_pci_numbers, judge_pci_dumps, judge_pci_modules,
                  judge_interrupts, judge_acpi, judge_boot, judge_clocks, judge_worlds,
                  judge_zombies, judge_matching, judge_descriptors, judge_signals, judge_volumes):
        try:
            check(machine, outputs)
        except (ValueError, IndexError, KeyError, AttributeError, OSError) as error:
            machine.faults.append(f'{check.__name__}: {error!r}')
    judge_recording(machine, release, commands)
    return machine.faults
