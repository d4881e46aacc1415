// Loaded into a program by LD_PRELOAD: makes chosen calls of it fail, come short or take long. System calls
// are caught where they reach the kernel (seccomp(2), SECCOMP_RET_TRAP), which hands them to a handler in the
// program itself: whoever makes them, the streams of the C library included, whose calls no function of
// another library could replace. Memory and threads are asked of functions, and those are replaced. What is
// to happen stands in the environment (FaultRun.h).

#include <dlfcn.h>
#include <fcntl.h>
#include <link.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <pthread.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <ucontext.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <string_view>

// The one place whose system calls the filter lets pass.
extern "C" long FaultShimSyscall(long number, long a, long b, long c, long d, long e, long f);
extern "C" const char kFaultShimSyscallEnd[];
__asm__(
    ".text\n"
    ".hidden FaultShimSyscall\n"
    ".hidden kFaultShimSyscallEnd\n"
    ".globl FaultShimSyscall\n"
    ".globl kFaultShimSyscallEnd\n"
    "FaultShimSyscall:\n"
    "    movq %rdi, %rax\n"
    "    movq %rsi, %rdi\n"
    "    movq %rdx, %rsi\n"
    "    movq %rcx, %rdx\n"
    "    movq %r8, %r10\n"
    "    movq %r9, %r8\n"
    "    movq 8(%rsp), %r9\n"
    "    syscall\n"
    "kFaultShimSyscallEnd:\n"
    "    ret\n");

extern "C" void* __libc_malloc(std::size_t size);

namespace {

enum Kind : std::size_t { kWrite, kOpen, kMkdir, kRename, kSync, kSpace, kMalloc, kThread, kKinds };

constexpr std::array<std::string_view, kKinds> kNames = {"write", "open",  "mkdir",  "rename",
                                                         "sync",  "space", "malloc", "thread"};

struct Plan {
    std::string_view folder;
    std::string_view suffix;
    std::size_t kind = kKinds;
    /// The first call that is hit, from 1, and how many are; 0 for all from there on.
    long from = 0;
    long count = 1;
    /// What becomes of it: an error number, half of what was to be written, or a wait in front of it.
    int error = 0;
    bool isShort = false;
    long delayMilliseconds = 0;
    int log = -1;
};

Plan plan;
std::array<std::atomic<long>, kKinds> counts;
/// Where the module lies in memory.
std::atomic<std::uintptr_t> moduleBegin;
std::atomic<std::uintptr_t> moduleEnd;

/// A path in a buffer of its own: nothing may be allocated in a handler.
class Path {
 public:
    std::string_view Text() const { return {text_.data(), size_}; }
    void Append(std::string_view text) {
        const std::size_t count = text.size() < text_.size() - size_ ? text.size() : text_.size() - size_;
        std::memcpy(text_.data() + size_, text.data(), count);
        size_ += count;
    }
    void AppendNumber(long number) {
        std::array<char, 24> digits{};
        std::size_t at = digits.size();
        do {
            digits[--at] = static_cast<char>('0' + number % 10);
            number /= 10;
        } while (number != 0);
        Append({digits.data() + at, digits.size() - at});
    }
    /// What a link below /proc leads to.
    void AppendLink(const char* link) {
        const long size = FaultShimSyscall(SYS_readlink, reinterpret_cast<long>(link),
                                           reinterpret_cast<long>(text_.data() + size_),
                                           static_cast<long>(text_.size() - size_), 0, 0, 0);
        size_ += size > 0 ? static_cast<std::size_t>(size) : 0;
    }
    void AppendDescriptor(int descriptor) {
        Path link;
        link.Append("/proc/self/fd/");
        link.AppendNumber(descriptor);
        link.Append(std::string_view("\0", 1));
        AppendLink(link.text_.data());
    }

 private:
    std::array<char, PATH_MAX + 64> text_{};
    std::size_t size_ = 0;
};

Path PathAt(long folder, long name) {
    const char* const text = reinterpret_cast<const char*>(name);
    Path path;
    if (text == nullptr || *text != '/') {
        if (static_cast<int>(folder) == AT_FDCWD) {
            path.AppendLink("/proc/self/cwd");
        } else {
            path.AppendDescriptor(static_cast<int>(folder));
        }
        path.Append("/");
    }
    path.Append(text == nullptr ? "" : text);
    return path;
}

Path PathOf(long descriptor) {
    Path path;
    if (descriptor >= 0) {
        path.AppendDescriptor(static_cast<int>(descriptor));
    }
    return path;
}

/// Enters a call in the log. True when it is one of those that are to be hit.
bool Hits(std::size_t kind, std::string_view path) {
    if (!path.starts_with(plan.folder)) {
        return false;
    }
    Path line;
    line.Append(kNames[kind]);
    line.Append(" ");
    line.Append(path);
    line.Append("\n");
    if (plan.log >= 0) {
        FaultShimSyscall(SYS_write, plan.log, reinterpret_cast<long>(line.Text().data()),
                         static_cast<long>(line.Text().size()), 0, 0, 0);
    }
    if (kind != plan.kind || !path.ends_with(plan.suffix)) {
        return false;
    }
    const long number = ++counts[kind];
    return plan.from != 0 && number >= plan.from && (plan.count == 0 || number < plan.from + plan.count);
}

void Delay() {
    timespec time{plan.delayMilliseconds / 1000, plan.delayMilliseconds % 1000 * 1000000};
    FaultShimSyscall(SYS_nanosleep, reinterpret_cast<long>(&time), 0, 0, 0, 0, 0);
}

/// Registers of a system call.
struct Call {
    long number;
    std::array<long, 6> arguments;

    long Make() const {
        return FaultShimSyscall(number, arguments[0], arguments[1], arguments[2], arguments[3], arguments[4],
                                arguments[5]);
    }
};

bool IsForWriting(long flags) {
    return (flags & O_ACCMODE) != O_RDONLY || (flags & O_CREAT) != 0;
}

bool IsHit(const Call& call) {
    const auto& arguments = call.arguments;
    switch (call.number) {
        case SYS_write:
        case SYS_pwrite64:
        case SYS_writev:
        case SYS_pwritev:
            return Hits(kWrite, PathOf(arguments[0]).Text());
        case SYS_open:
            return IsForWriting(arguments[1]) && Hits(kOpen, PathAt(AT_FDCWD, arguments[0]).Text());
        case SYS_openat:
            return IsForWriting(arguments[2]) && Hits(kOpen, PathAt(arguments[0], arguments[1]).Text());
        case SYS_mkdir:
            return Hits(kMkdir, PathAt(AT_FDCWD, arguments[0]).Text());
        case SYS_mkdirat:
            return Hits(kMkdir, PathAt(arguments[0], arguments[1]).Text());
        case SYS_rename:
            return Hits(kRename, PathAt(AT_FDCWD, arguments[1]).Text());
        case SYS_renameat:
        case SYS_renameat2:
            return Hits(kRename, PathAt(arguments[2], arguments[3]).Text());
        case SYS_fsync:
        case SYS_fdatasync:
            return Hits(kSync, PathOf(arguments[0]).Text());
        case SYS_statfs:
            return Hits(kSpace, PathAt(AT_FDCWD, arguments[0]).Text());
        case SYS_fstatfs:
            return Hits(kSpace, PathOf(arguments[0]).Text());
        default:
            return false;
    }
}

long Answer(Call call) {
    if (!IsHit(call)) {
        return call.Make();
    }
    if (plan.delayMilliseconds != 0) {
        Delay();
    }
    if (plan.error != 0) {
        return -plan.error;
    }
    const bool isPlainWrite = call.number == SYS_write || call.number == SYS_pwrite64;
    if (plan.isShort && isPlainWrite && call.arguments[2] > 1) {
        call.arguments[2] /= 2;
    }
    return call.Make();
}

void OnTrap(int, siginfo_t* information, void* context) {
    greg_t* const registers = static_cast<ucontext_t*>(context)->uc_mcontext.gregs;
    registers[REG_RAX] = Answer({information->si_syscall,
                                 {registers[REG_RDI], registers[REG_RSI], registers[REG_RDX],
                                  registers[REG_R10], registers[REG_R8], registers[REG_R9]}});
}

sock_filter Load(std::size_t offset) {
    return BPF_STMT(BPF_LD | BPF_W | BPF_ABS, static_cast<std::uint32_t>(offset));
}
sock_filter SkipUnless(std::uint64_t value, std::uint8_t skipped) {
    return BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, static_cast<std::uint32_t>(value), 0, skipped);
}
sock_filter Give(std::uint32_t value) {
    return BPF_STMT(BPF_RET | BPF_K, value);
}

bool CatchSystemCalls() {
    struct sigaction action = {};
    action.sa_sigaction = OnTrap;
    action.sa_flags = SA_SIGINFO | SA_NODEFER;
    if (sigaction(SIGSYS, &action, nullptr) != 0) {
        return false;
    }
    constexpr std::array kCaught = {SYS_write,     SYS_pwrite64, SYS_writev,    SYS_pwritev, SYS_open,
                                    SYS_openat,    SYS_mkdir,    SYS_mkdirat,   SYS_rename,  SYS_renameat,
                                    SYS_renameat2, SYS_fsync,    SYS_fdatasync, SYS_statfs,  SYS_fstatfs};
    constexpr std::size_t kPointer = offsetof(seccomp_data, instruction_pointer);
    const auto end = reinterpret_cast<std::uintptr_t>(kFaultShimSyscallEnd);
    std::array<sock_filter, 6 + 2 * kCaught.size() + 1> filter{};
    std::size_t at = 0;
    filter[at++] = Load(kPointer);
    filter[at++] = SkipUnless(end, 3);
    filter[at++] = Load(kPointer + 4);
    filter[at++] = SkipUnless(end >> 32, 1);
    filter[at++] = Give(SECCOMP_RET_ALLOW);
    filter[at++] = Load(offsetof(seccomp_data, nr));
    for (const long number : kCaught) {
        filter[at++] = SkipUnless(static_cast<std::uint64_t>(number), 1);
        filter[at++] = Give(SECCOMP_RET_TRAP);
    }
    filter[at++] = Give(SECCOMP_RET_ALLOW);
    const sock_fprog program{static_cast<unsigned short>(at), filter.data()};
    return prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0 &&
           prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program) == 0;
}

std::string_view Variable(const char* name) {
    const char* const value = std::getenv(name);
    return value == nullptr ? std::string_view() : std::string_view(value);
}

long NumberIn(const char* name) {
    return std::strtol(Variable(name).data() == nullptr ? "0" : Variable(name).data(), nullptr, 10);
}

__attribute__((constructor)) void Begin() {
    plan.folder = Variable("FAULT_FOLDER");
    plan.suffix = Variable("FAULT_SUFFIX");
    for (std::size_t kind = 0; kind < kKinds; ++kind) {
        plan.kind = Variable("FAULT_KIND") == kNames[kind] ? kind : plan.kind;
    }
    plan.from = NumberIn("FAULT_FROM");
    plan.count = NumberIn("FAULT_COUNT");
    plan.error = static_cast<int>(NumberIn("FAULT_ERROR"));
    plan.isShort = NumberIn("FAULT_SHORT") != 0;
    plan.delayMilliseconds = NumberIn("FAULT_DELAY");
    if (const std::string_view log = Variable("FAULT_LOG"); !log.empty()) {
        plan.log = open(log.data(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
    }
    if (plan.folder.empty() || !CatchSystemCalls()) {
        std::fputs("FaultShim: system calls cannot be caught\n", stderr);
        _exit(125);
    }
}

int FindModule(dl_phdr_info* object, std::size_t, void*) {
    if (std::string_view(object->dlpi_name).find("/libclipfile.so") == std::string_view::npos) {
        return 0;
    }
    for (int i = 0; i < object->dlpi_phnum; ++i) {
        const auto& segment = object->dlpi_phdr[i];
        if (segment.p_type == PT_LOAD && (segment.p_flags & PF_X) != 0) {
            moduleEnd = object->dlpi_addr + segment.p_vaddr + segment.p_memsz;
            moduleBegin = object->dlpi_addr + segment.p_vaddr;
        }
    }
    return 1;
}

template <typename Function>
Function* Real(const char* name) {
    return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

#define FAULT_SHIM_EXPORT extern "C" __attribute__((visibility("default")))

FAULT_SHIM_EXPORT void* dlopen(const char* file, int mode) noexcept {
    void* const library = Real<void*(const char*, int)>("dlopen")(file, mode);
    if (moduleBegin == 0) {
        dl_iterate_phdr(FindModule, nullptr);
    }
    return library;
}

/// A thread that kept the signal from the handler would be killed by it.
FAULT_SHIM_EXPORT int pthread_sigmask(int how, const sigset_t* set, sigset_t* before) noexcept {
    sigset_t without;
    if (set != nullptr && how != SIG_UNBLOCK) {
        without = *set;
        sigdelset(&without, SIGSYS);
        set = &without;
    }
    static auto* const mask = Real<int(int, const sigset_t*, sigset_t*)>("pthread_sigmask");
    return mask(how, set, before);
}

/// Memory that the module asks of the C library itself, as its box library does for all that it holds. What
/// `new` gives comes from the C++ library, and throws where there is none.
FAULT_SHIM_EXPORT void* malloc(std::size_t size) noexcept {
    const auto caller = reinterpret_cast<std::uintptr_t>(__builtin_return_address(0));
    if (caller >= moduleBegin && caller < moduleEnd && Hits(kMalloc, plan.folder)) {
        errno = ENOMEM;
        return nullptr;
    }
    return __libc_malloc(size);
}

FAULT_SHIM_EXPORT int pthread_create(pthread_t* thread, const pthread_attr_t* attributes, void* (*run)(void*),
                                     void* argument) noexcept {
    static auto* const create =
        Real<int(pthread_t*, const pthread_attr_t*, void* (*)(void*), void*)>("pthread_create");
    return Hits(kThread, plan.folder) ? plan.error : create(thread, attributes, run, argument);
}
