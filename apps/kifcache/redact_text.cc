#include "redact_text.h"

#include <algorithm>
#include <iterator>

namespace {

constexpr std::string_view kDeleted = " (deleted)";
constexpr std::string_view kUpper = "ABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789_-?";
constexpr std::string_view kDigits = "0123456789";

struct KindOfName {
  Privacy kind;
  const char *word;
};
constexpr KindOfName kKinds[] = {
    {Privacy::kAddress, "address-"}, {Privacy::kPath, "path-"}, {Privacy::kMountPoint, "mount-"},
    {Privacy::kBootEntry, "entry-"}, {Privacy::kUser, "user-"}, {Privacy::kDevice, "device-"},
    {Privacy::kName, "name-"},
};

// Names that tell nothing of a system, for every one has them. kifcache(1) lists them.
constexpr std::string_view kEverywhere =
    // mount points
    " / /boot /boot/efi /dev /dev/hugepages /dev/mqueue /dev/pts /dev/shm /etc /home /media "
    "/mnt /opt /proc /root /run /run/lock /srv /sys /sys/fs/bpf /sys/fs/cgroup /sys/fs/pstore "
    "/sys/kernel/debug /sys/kernel/security /sys/kernel/tracing /tmp /usr /var /var/lib "
    "/var/log /var/tmp "
    // devices, and file systems without one
    "/dev/console /dev/full /dev/kmsg /dev/null /dev/ptmx /dev/random /dev/tty /dev/urandom "
    "/dev/zero bpf cgroup cgroup2 debugfs devpts devtmpfs hugetlbfs mqueue none overlay proc "
    "pstore securityfs sysfs tmpfs tracefs udev "
    // boot option files
    "/boot/grub/grub.cfg /etc/default/grub /etc/kernel/cmdline "
    // mappings without a file
    "[heap] [stack] [uprobes] [vdso] [vsyscall] [vvar] [vvar_vclock] "
    // addresses, and root
    "* 0.0.0.0 127.0.0.1 :: ::1 00:00:00:00:00:00 root ";

// Options of the boot command line whose names stay. kifcache(1) lists them.
constexpr std::string_view kBootOptions =
    " -- BOOTIF acpi amd_iommu amd_pstate apparmor audit cgroup_disable cgroup_enable "
    "clocksource console crashkernel debug default_hugepagesz earlycon earlyprintk fsck.mode "
    "fsck.repair hugepages hugepagesz idle init initrd intel_idle.max_cstate intel_iommu "
    "intel_pstate iommu ip ipv6.disable irqaffinity isolcpus lockdown loglevel lsm maxcpus "
    "mem mitigations module.sig_enforce net.ifnames nmi_watchdog noapic nohz nohz_full "
    "nomodeset nosmt nowatchdog nr_cpus numa numa_balancing oops panic pci pcie_aspm preempt "
    "processor.max_cstate quiet random.trust_cpu rcu_nocbs reboot resume rhgb ro root "
    "rootflags rootfstype rootwait rw security selinux single splash swapaccount systemd.unit "
    "transparent_hugepage tsc zswap.enabled ";

// Whether a text is a word of a list, which has blanks around each.
bool IsOneOf(std::string_view text, std::string_view words) {
  const std::string word = " " + std::string(text) + " ";
  return text.find(' ') == text.npos && words.find(word) != words.npos;
}

bool HasOnly(std::string_view text, std::string_view characters) {
  return !text.empty() && text.find_first_not_of(characters) == text.npos;
}

// Takes `end` off the text, if it ends so.
bool TakeOff(std::string_view *text, std::string_view end) {
  if (!text->ends_with(end)) return false;
  text->remove_suffix(end.size());
  return true;
}

// Takes the last part of the text off it, from `begin` on; empty where there is none.
std::string_view TakeFromLast(std::string_view *text, std::string_view begin) {
  const size_t place = text->rfind(begin);
  if (place == text->npos) return {};
  const std::string_view part = text->substr(place);
  text->remove_suffix(part.size());
  return part;
}

// "pipe:[4026]", "anon_inode:[eventfd]": the kernel's names of what no user named.
bool IsKernelsName(std::string_view text) {
  constexpr std::string_view kInode = "anon_inode:";
  constexpr std::string_view kLower = "abcdefghijklmnopqrstuvwxyz_";
  constexpr std::string_view kInodeName = "abcdefghijklmnopqrstuvwxyz0123456789_-.:[]";
  if (text.starts_with(kInode)) return HasOnly(text.substr(kInode.size()), kInodeName);
  const size_t colon = text.find(":[");
  return colon != text.npos && text.ends_with(']') && HasOnly(text.substr(0, colon), kLower) &&
         HasOnly(text.substr(colon + 2, text.size() - colon - 3), kDigits);
}

// The protocols that the kernel has: "TCP", "UDPv6", "UNIX-STREAM".
bool IsProtocol(std::string_view word) {
  if (word == "unix" || word == "netlink" || word == "packet") return true;
  TakeOff(&word, "v6");
  return word.size() < 16 && HasOnly(word, kUpper);
}

// "protocol=0x0003 type=RAW"
bool IsPacketSocket(std::string_view text) {
  constexpr std::string_view kProtocol = "protocol=0x";
  const std::string_view type = TakeFromLast(&text, " type=");
  return text.starts_with(kProtocol) && type.size() > 6 && HasOnly(type.substr(6), kUpper) &&
         HasOnly(text.substr(kProtocol.size()), "0123456789abcdef");
}

// Takes a state in parentheses off the text; false where what stands there is no state.
bool TakeState(std::string_view *text, std::string_view *state) {
  *state = {};
  if (!text->ends_with(')')) return true;
  *state = TakeFromLast(text, " (");
  return state->size() > 3 && HasOnly(state->substr(2, state->size() - 3), kUpper);
}

// The first word of `text`, which is taken off it with the blanks before it. A blank between double
// quotes does not end a word, for the kernel neither.
std::string_view TakeWord(std::string_view *text) {
  const size_t start = text->find_first_not_of(" \t\n");
  text->remove_prefix(start == text->npos ? text->size() : start);
  bool quoted = false;
  size_t end = 0;
  for (; end < text->size(); ++end) {
    const char c = (*text)[end];
    if (c == '"') quoted = !quoted;
    if (!quoted && (c == ' ' || c == '\t' || c == '\n')) break;
  }
  const std::string_view word = text->substr(0, end);
  text->remove_prefix(end);
  return word;
}

std::string OfCommandLine(std::string_view text, std::string_view program) {
  if (program.empty()) return kEllipsis;
  const std::string whole = std::string(program) + " " + kEllipsis;
  if (text == program || text == whole) return std::string(text);
  return text.find_first_of(" \t") == text.npos ? std::string(program) : whole;
}

}  // namespace

std::string RedactedTexts::NewName(std::string_view text, Privacy kind) {
  const auto *row = std::find_if(std::begin(kKinds), std::end(kKinds) - 1,
                                 [kind](const KindOfName &known) { return known.kind == kind; });
  const std::string name = row->word + std::to_string(++numbers_[row->kind]);
  return names_.emplace(text, name).first->second;
}

std::string RedactedTexts::NameOf(std::string_view text, Privacy kind, bool isCut) {
  if (text.empty() || IsOneOf(text, kEverywhere)) return std::string(text);
  for (const KindOfName &known : kKinds) {
    if (!isAgain_ || !text.starts_with(known.word)) continue;
    const std::string_view digits = text.substr(std::string_view(known.word).size());
    if (!HasOnly(digits, kDigits) || digits[0] == '0' || digits.size() > 18) continue;
    uint64_t number = 0;
    for (const char digit : digits) number = number * 10 + static_cast<uint64_t>(digit - '0');
    numbers_[known.kind] = std::max(numbers_[known.kind], number);
    return std::string(text);
  }
  if (isNoting_) return std::string(text);
  const auto found = names_.lower_bound(text);
  if (found != names_.end() && (isCut ? found->first.starts_with(text) : found->first == text)) {
    return found->second;
  }
  return NewName(text, kind);
}

std::string RedactedTexts::OfPath(std::string_view text, Privacy kind, bool isCut) {
  if (IsKernelsName(text)) return std::string(text);
  const bool isDeleted = TakeOff(&text, kDeleted);
  return NameOf(text, kind, isCut && !isDeleted).append(isDeleted ? kDeleted : "");
}

// "NAME type=STREAM (LISTEN)"
std::string RedactedTexts::OfUnixSocket(std::string_view text) {
  std::string_view state;
  if (!TakeState(&text, &state) || state.empty()) return kEllipsis;
  const std::string_view type = TakeFromLast(&text, " type=");
  if (type.size() < 7 || !HasOnly(type.substr(6), kUpper)) return kEllipsis;
  const Privacy kind = text.starts_with('/') ? Privacy::kPath : Privacy::kName;
  const std::string name = IsKernelsName(text) ? std::string(text) : NameOf(text, kind);
  return name + std::string(type) + std::string(state);
}

// "ADDRESS:PORT" or "[ADDRESS]:PORT"; empty where the text is none.
std::string RedactedTexts::OfEndpoint(std::string_view text) {
  const std::string_view port = TakeFromLast(&text, ":");
  if (port.size() < 2 || (port != ":*" && !HasOnly(port.substr(1), kDigits))) return {};
  std::string_view address = text;
  const bool isBracketed = address.starts_with('[') && TakeOff(&address, "]");
  if (isBracketed) address.remove_prefix(1);
  const std::string name = NameOf(address, Privacy::kAddress);
  return (name == address ? std::string(text) : name) + std::string(port);
}

// "LOCAL->REMOTE (ESTABLISHED)"
std::string RedactedTexts::OfConnection(std::string_view text) {
  std::string_view state;
  if (!TakeState(&text, &state)) return kEllipsis;
  const size_t arrow = text.find("->");
  std::string redacted = OfEndpoint(text.substr(0, arrow));
  if (redacted.empty()) return kEllipsis;
  if (arrow != text.npos) {
    const std::string remote = OfEndpoint(text.substr(arrow + 2));
    if (remote.empty()) return kEllipsis;
    redacted += "->" + remote;
  }
  return redacted + std::string(state);
}

std::string RedactedTexts::OfSocket(std::string_view text) {
  if (text.empty() || text.starts_with('/') || IsKernelsName(text)) {
    return OfPath(text, Privacy::kPath, false);
  }
  const std::string_view protocol = text.substr(0, text.find(' '));
  // A path that has been redacted.
  if (isAgain_ && text.starts_with("path-")) return OfPath(text, Privacy::kPath, false);
  if (!IsProtocol(protocol)) return kEllipsis;
  if (protocol == text) return std::string(text);
  const std::string_view rest = text.substr(protocol.size() + 1);
  std::string redacted = std::string(protocol) + " ";
  if (protocol == "unix") return redacted + OfUnixSocket(rest);
  const bool isPublic = protocol == "netlink"  ? HasOnly(rest, kUpper)
                        : protocol == "packet" ? IsPacketSocket(rest)
                                               : false;
  return redacted + (isPublic ? std::string(rest) : OfConnection(rest));
}

// The name that every distribution gives the file, with the release that is told elsewhere, too.
std::string RedactedTexts::OfKernel(std::string_view file) const {
  const size_t slash = file.rfind('/');
  if (slash != file.npos) file.remove_prefix(slash + 1);
  const bool isUsual = file == "vmlinuz" || (!release_.empty() && file == "vmlinuz-" + release_);
  return isUsual ? std::string(file) : kEllipsis;
}

std::string RedactedTexts::OfBootCommandLine(std::string_view text) const {
  std::string redacted = OfKernel(TakeWord(&text));
  bool isFolded = false;
  bool isInits = false;
  for (std::string_view word = TakeWord(&text); !word.empty(); word = TakeWord(&text)) {
    const size_t equals = word.find('=');
    const std::string_view name = word.substr(0, equals);
    if (!isInits && IsOneOf(name, kBootOptions)) {
      redacted.append(" ").append(name).append(equals != word.npos ? "=" : "");
      if (equals != word.npos) redacted += kEllipsis;
      isFolded = false;
    } else {
      if (!isFolded) redacted.append(" ").append(kEllipsis);
      isFolded = true;
    }
    isInits = isInits || word == "--";
  }
  return redacted;
}

std::string RedactedTexts::OfText(std::string_view text, Privacy privacy, std::string_view program,
                                  bool isCut) {
  if (text.empty() || privacy == Privacy::kPublic) return std::string(text);
  switch (privacy) {
    case Privacy::kCommandLine:
      return OfCommandLine(text, program);
    case Privacy::kBootCommandLine:
      return OfBootCommandLine(text);
    case Privacy::kSocket:
      return OfSocket(text);
    case Privacy::kPrivate:
    case Privacy::kWithheld:
      return kEllipsis;
    default:
      return OfPath(text, privacy, isCut);
  }
}

std::string RedactedTexts::OfParameter(std::string_view text, Privacy privacy) {
  return privacy == Privacy::kPublic ? std::string(text) : NameOf(text, privacy);
}
