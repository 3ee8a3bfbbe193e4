"""Whether the tools agreed with their peers on a machine, and whether the recording says the same.

What init kept of a run is in folders: before and after (every command of the list, around the
recording), first and last (what /proc and the peers said around all that), and the rest.
"""
import difflib
import os
import pathlib
import re
import subprocess


class Machine:
    """What a machine handed out, and the commands of the list by their text."""

    def __init__(self, folder, commands):
        self.folder = folder
        self.commands = commands
        self.faults = []

    def read(self, path):
        return pathlib.Path(self.folder, path).read_bytes()

    def text(self, path):
        return self.read(path).decode('utf-8', 'replace')

    def lines(self, path):
        return self.text(path).splitlines()

    def names(self, path):
        return sorted(os.listdir(f'{self.folder}/{path}'))

    def out(self, command):
        return self.text(f'before/{self.commands.index(command) + 1}.out')

    def rows(self, command):
        return self.out(command).splitlines()

    def expect(self, ours, theirs, what):
        if ours != theirs:
            self.faults.append(f'{what}:\n    ours   {short(ours)}\n    theirs {short(theirs)}')

    def expect_that(self, holds, what):
        if not holds:
            self.faults.append(what)


def short(value):
    text = repr(value)
    return text if len(text) < 700 else text[:700] + '...'


# PCI.

def judge_pci_names(machine):
    """pciutils names the subclass, which is what -v adds; where the file has no name it makes one
    up, and where it has none of a subclass it takes that of the class."""
    ours = [line for line in machine.rows('lspci -v') if line and line[0] != '\t']
    theirs = machine.lines('peers/lspci_names.out')
    machine.expect(len(ours), len(theirs), 'functions with names')
    for mine, line in zip(ours, theirs):
        address, fields = line.split(' ', 1)[0], re.findall(r'"([^"]*)"', line)
        kind = ' :' if '[' in fields[0] else fields[0] + ' '
        names = ':   ' if fields[2].startswith('Device ') else f': {fields[1]} '
        machine.expect_that(mine.startswith(f'{address} {kind}') and names in mine,
                            f'names: {mine} / {line}')


def judge_pci_numbers(machine):
    theirs = [re.sub(r'^(\S+) (\S+ \S+).*', r'\1 Class \2 ', line)
              for line in machine.lines('peers/lspci_numbers.out')]
    machine.expect([line.split('[')[0] for line in machine.rows('lspci -n')], theirs, 'lspci -n')
    machine.expect_that(len(theirs) >= 4, 'the machine has hardly any functions')


def judge_pci_dumps(machine):
    def addresses_and_bytes(lines):
        return [line if re.match(r'[0-9a-f]{2,3}: ', line) else line.split(' ')[0]
                for line in lines if line]
    # Ours ends with the first function that has no extended space; pciutils goes on with a short
    # one.
    for command, peer, is_whole in (('-nd', 'dump', True), ('-ne', 'extended', False)):
        ours = addresses_and_bytes(machine.rows(f'lspci {command}'))
        theirs = addresses_and_bytes(machine.lines(f'peers/lspci_{peer}.out'))
        machine.expect(ours, theirs if is_whole else theirs[:len(ours)], f'lspci {command}')
    for address in machine.names('config'):
        config = machine.read(f'config/{address}')
        machine.expect(machine.read(f'pci-info/{address}.out'), config[:256], f'{address} -c')
        extended = config if len(config) == 4096 else b''
        machine.expect(machine.read(f'pci-info/{address}.extended.out'), extended, f'{address} -e')


def judge_pci_modules(machine):
    """A driver's module has the driver's name, with other hyphens, or is one that pciutils
    lists."""
    theirs = {}
    for line in machine.lines('peers/lspci_drivers.out'):
        if line[0] != '\t':
            theirs[line.split(' ')[0]] = peer = {}
        elif line.startswith('\tKernel '):
            peer.update([line[8:].split(': ')])
    ours = {line[:12]: line[50:62].strip() for line in machine.rows('lspci -p')[2:]
            if line[0] != ' '}
    machine.expect(sorted(ours), sorted(theirs), 'lspci -p')
    for address, module in ours.items():
        peer = theirs.get(address, {})
        driver, modules = peer.get('driver in use', ''), peer.get('modules', '')
        machine.expect_that(module.replace('_', '-') == driver.replace('_', '-') or
                            (driver and module in modules.split(', ')),
                            f'module of {address}: {module} / {driver} of {modules}')


# Platform.

def judge_interrupts(machine):
    """The same numbers, and counts between those that /proc said before and after."""
    def table(stage):
        head, *lines = [line.split() for line in machine.lines(f'{stage}/interrupts')]
        return {int(words[0][:-1]): ([int(word) for word in words[1:1 + len(head)]],
                                     ' '.join(words))
                for words in lines if words[0][:-1].isdigit()}
    first, last = table('first'), table('last')
    ours = {int(cookie, 16): rest for cookie, rest in
            (line.split(':', 1) for line in machine.rows('irqinfo')[1:])}
    machine.expect(sorted(ours), sorted(first), 'irqinfo')
    for number in ours.keys() & first.keys() & last.keys():
        low, high = first[number][0], last[number][0]
        counts = [int(word) for word in ours[number].split()[:len(low)]]
        machine.expect_that(all(a <= b <= c for a, b, c in zip(low, counts, high)),
                            f'interrupt {number}: {low} <= {counts} <= {high}')
        for name in re.findall(r'ZLK ([^,]+)', ours[number]):
            machine.expect_that(name in first[number][1], f'interrupt {number}: {name}')
    machine.expect(machine.rows('irqinfo')[0].count('PCPU'), int(machine.text('peers/cpus.out')),
                   'CPUs')


def judge_acpi(machine):
    def tables(folder):
        return sorted((name[:4], machine.read(f'{folder}/{name}')) for name in machine.names(folder)
                      if os.path.isfile(f'{machine.folder}/{folder}/{name}'))
    machine.expect_that(tables('aml') == tables('tables'),
                        f'ACPI tables: {machine.names("aml")} / {machine.names("tables")}')


def judge_boot(machine):
    line = machine.text('peers/cmdline.out').strip()
    words = line.split(' ')
    system, _, release, build, *_ = machine.text('peers/uname.out').split()
    kernel, options = 'vmlinuz-' + release, line
    if words[0].startswith('BOOT_IMAGE='):
        kernel, options = words[0][len('BOOT_IMAGE='):], ' '.join(words[1:])
    flags = ['fsck.mode=force' in words, 'audit=1' in words, False, 'BOOTIF=' in line]
    values = [label.split(' : ')[1] for label in machine.rows('bootOption -afip')]
    machine.expect(values, [str(int(flag)) for flag in flags], 'bootOption -afip')
    build = int(re.match(r'#(\d+)', build)[1])
    for command, theirs in (
            ('bootOption -rko', f'{kernel}\n{options}\n'),
            ('bootOption -m', 'Modules : ' + '/run/archive ' * ('overlay' in words) + '\n'),
            ('bootOption -b', 'Boot Option Files : /etc/kernel/cmdline \n'),
            ('zelvar -v', f'{system} {release} build-{build:05}\n')):
        machine.expect(machine.out(command), theirs, command)
    machine.expect(machine.text('peers/boot_files.out').strip(), 'root=/dev/vda ro quiet',
                   'bootOption -rC')


def judge_clocks(machine):
    """The emulated clock stood at noon of a leap day when the machine began; it is set and read
    back by us and by busybox."""
    clock = machine.out('hwclock')
    if '0xbad0003' not in clock or machine.text('first/busybox_hwclock.status').strip() == '0':
        for said, pattern in (
                (clock, r'12:\d\d:\d\d   02/29/2024   UTC\n'),
                (machine.text('clock/set.out'),
                 'Clock updated.\nTime: 23:58:07   Date: 02/28/2031   UTC\n'),
                (machine.text('clock/busybox.out'), r'Fri Feb 28 23:58:\d\d 2031(?s:.*)'),
                (machine.text('clock/ours.out'), r'23:58:\d\d   02/28/2031   UTC(?s:.*)')):
            machine.expect_that(re.fullmatch(pattern, said), f'clock: {said}')
    up = [float(machine.text(f'{stage}/uptime').split()[0]) for stage in ('first', 'last')]
    times = re.search(r'up (?:(\d+) days, )?(\d+):(\d+):(\d+),', machine.out('uptime')).groups()
    days, hours, minutes, seconds = (int(time or 0) for time in times)
    ours = ((days * 24 + hours) * 60 + minutes) * 60 + seconds
    machine.expect_that(int(up[0]) <= ours <= up[1], f'uptime: {ours} not in {up}')


# Worlds.

class Process:
    def __init__(self, line):
        number, stat, self.command, self.namespace = line.split('|')
        self.id = int(number)
        self.name, rest = re.match(r'.*?\((.*)\) (.*)', stat).groups()
        self.state, _, *self.groups = rest.split()[:4]


def processes(machine, stage):
    """The processes by ID, those without a program (kernel threads, zombies) left out."""
    lines = machine.lines(f'{stage}/processes')
    return {int(line.split('|')[0]): Process(line) for line in lines if '(' in line}


def stable_processes(machine):
    first, last = processes(machine, 'first'), processes(machine, 'last')
    return {number: process for number, process in first.items()
            if number in last and last[number].name == process.name}


def by_number(lines):
    """The words of each line that has any, by its first, a number."""
    return {int(words[0]): words for words in map(str.split, lines) if words}


def judge_worlds(machine):
    peers = stable_processes(machine)
    machine.expect_that(len(peers) >= 12, f'only {len(peers)} processes')
    ours = by_number(machine.rows('ps -usTtcU')[1:])
    groups = by_number(machine.rows('ps -Cgj')[1:])
    for number, process in peers.items():
        words = ours.get(number, [''] * 9)
        state = {'S': 'SLEEP', 'R': 'RUN', 'D': 'DISK'}.get(process.state)
        machine.expect([words[1], words[2], words[4], *words[9:]],
                       [str(number), process.name, state, *process.command.split()],
                       f'ps of {number}')
        machine.expect(groups.get(number, [])[-2:], process.groups, f'groups of {number}')
    judge_userspaces(machine, ours, peers)


def judge_userspaces(machine, ours, peers):
    """Processes are in one userspace where they are in one PID namespace; the reader's is 1."""
    numbers = {}
    for number in peers.keys() & ours.keys():
        numbers.setdefault(peers[number].namespace, set()).add(int(ours[number][8]))
    machine.expect(sorted(map(list, numbers.values())),
                   [[number + 1] for number in range(len(numbers))], 'userspaces')
    machine.expect(numbers.get(peers[1].namespace), {1}, "init's userspace")
    asked = by_number(machine.lines('peers/userspaces'))
    machine.expect_that(len(asked) >= len(peers), f'only {len(asked)} userspaces')
    for number in asked.keys() & ours.keys():
        machine.expect(asked[number][1], ours[number][8], f'userspaceof {number}')


def judge_zombies(machine):
    """Those that hang under a world that /proc shows to have such a child."""
    zombies = {line.split()[0] for line in machine.rows('ps -z') if '<zombie>' in line}
    parents = {number for number, process in stable_processes(machine).items()
               if re.search(r'^sleep 1000[123]', process.command)}
    machine.expect_that(len(parents) == 3 and len(zombies) >= 3,
                        f'zombies {zombies} of {parents}')


def judge_matching(machine):
    def numbers(text):
        return sorted(map(int, re.findall(r'\d+', text)))
    # The peer also gives zombies, which are no cartels.
    alive = processes(machine, 'first')
    sleepers = numbers(machine.text('peers/pidof.out'))
    machine.expect(numbers(machine.out('pidof sleep')),
                   [number for number in sleepers if number in alive], 'pidof sleep')
    listed = by_number(machine.rows('pgrep -l .'))
    stable = stable_processes(machine)
    for number, process in stable.items():
        machine.expect(listed.get(number, [])[1:2], process.command.split()[:1],
                       f'pgrep of {number}')
    machine.expect(numbers(machine.out('pgrep -f archive')),
                   sorted(number for number in stable if 'archive' in stable[number].command),
                   'pgrep -f archive')


def judge_descriptors(machine):
    """Files by their paths; of what else a descriptor can be, that it is there."""
    def table(stage):
        links = (re.match(r'/proc/(\d+)/fd/(\S*) ?(.*)', line)
                 for line in machine.lines(f'{stage}/descriptors'))
        return {(link[1], link[2]): link[3] for link in links if link}
    last = table('last')
    ours = {(words[0], words[3]): ' '.join(words[4:])
            for words in map(str.split, machine.rows('lsof')[2:]) if words[2] != 'MMAP'}
    for key, target in table('first').items():
        if key[0] == '1' or last.get(key) != target or not target:
            continue
        machine.expect_that(key in ours, f'lsof lacks {key} {target}')
        if target.startswith('/'):
            machine.expect(ours.get(key), target, f'descriptor {key}')
    for pattern in (r'\(deleted\)', 'TCP.*7000'):
        machine.expect_that(any(re.search(pattern, target) for target in ours.values()),
                            f'no descriptor is {pattern}')


def judge_signals(machine):
    ends = {'first': '129', 'second': '143', 'third': '137'}
    for stage, theirs in ('all', ends), ('left', ['third']), ('none', []):
        ours = sorted(line.split()[1] for line in machine.lines(f'signals/{stage}.out'))
        machine.expect(ours, [f'/tmp/busybox-{name}' for name in theirs], f'sleepers: {stage}')
    for name, end in ends.items():
        machine.expect(machine.text(f'signals/{name}.ended').strip(), end, f'end of {name}')


# File systems.

def judge_volumes(machine):
    rows = {}
    for line in machine.rows('mdf'):
        match = re.match(r'(/.*?) +(\d+) +(\d+)(?: +(\d+) +(\d+)% --)?$', line)
        if match:
            rows[match[1]] = [int(word) for word in match.groups()[1:4] if word]
    for words in map(str.split, machine.lines('peers/df.out')[1:]):
        theirs = [int(word) for word in words[1:4]]
        if words[5] == '/mnt/archive':
            theirs = [(theirs[0] + 3) // 4 * 4, theirs[1]]
        machine.expect(rows.get(words[5]), theirs, f'mdf of {words[5]}')
    machine.expect(re.findall(r' (/\S+): +(\d+)', machine.text('peers/unlinked.out')),
                   [('/mnt/ram/gone', str(len('held\n')))], 'mdu -u')


# The recording.

# The recording has kifcache itself among the processes.
OF_PROCESSES = ('ps', 'pidof', 'pgrep', 'lsof')
# Threads of the kernel that change their names, and what the scene redirects.
BUSY = rb'kworker/|^1 init (FILE|CHAR|PIPE)'


def run_outside(program, arguments, host='none'):
    environment = {'PATH': '/usr/bin:/bin', 'TZ': 'UTC', 'ZELLIBS_HOST': host}
    return subprocess.run([program, *arguments], env=environment, stdin=subprocess.DEVNULL,
                          capture_output=True, check=False)


def squeezed(output):
    """The lines; how wide a column is depends on what moved."""
    return [b' '.join(line.split()) for line in output.splitlines()]


def judge_recording(machine, release):
    """What a command said alike before and after the recording is said by the recording, in the
    same order; where nothing moved, to the byte."""
    file = f'{machine.folder}/machine.kif'
    checked = run_outside(f'{release}/bin/kifcache', ['check', file])
    machine.expect(checked.returncode, 0, 'kifcache check')
    tools = f'{release}/bin/zlkkiftools'
    for number, command in enumerate(machine.commands, 1):
        outside = run_outside(tools, ['-c', file, *command.split()])
        before, after = (machine.read(f'{stage}/{number}.out') for stage in ('before', 'after'))
        machine.expect((outside.returncode, outside.stderr),
                       (int(machine.text(f'before/{number}.status')),
                        machine.read(f'before/{number}.err')), f'end of {command} outside')
        if before == after and command.split()[0] not in OF_PROCESSES:
            diff = difflib.diff_bytes(difflib.unified_diff, outside.stdout.splitlines(True),
                                      before.splitlines(True), n=0)
            machine.expect([*diff], [], f'{command} outside')
            continue
        later = set(squeezed(after))
        stable = [line for line in squeezed(before)
                  if line in later and not re.search(BUSY, line)]
        said = squeezed(outside.stdout)
        rest = iter(said)
        machine.expect_that(all(line in rest for line in stable), f'{command} outside lacks '
                            f'{short([line for line in stable if line not in said])}')
    served = run_outside(tools, ['bootOption', '-rC'], host=file)
    machine.expect(served.stdout, machine.read('peers/boot_files.out'), 'boot option files outside')


def judge(folder, release, command_line):
    """What is wrong: one text a fault."""
    commands = pathlib.Path(__file__).with_name('commands').read_text()
    machine = Machine(folder, re.split(r'; |\n', commands.strip()))
    machine.expect(machine.text('peers/cmdline.out').strip(), command_line, 'kernel command line')
    for check in (judge_pci_names, judge_pci_numbers, judge_pci_dumps, judge_pci_modules,
                  judge_interrupts, judge_acpi, judge_boot, judge_clocks, judge_worlds,
                  judge_zombies, judge_matching, judge_descriptors, judge_signals, judge_volumes):
        try:
            check(machine)
        except (ValueError, IndexError, KeyError, AttributeError, OSError) as error:
            machine.faults.append(f'{check.__name__}: {error!r}')
    judge_recording(machine, release)
    return machine.faults
