"""Helpers of bench/linux.sh: the namespace host of one size, the interleaved timing, the report.

    linux_host.py build N                 the host as `ip -batch` commands
    linux_host.py time N HADROCLI RUNS    median ms of each command, as TSV lines
    linux_host.py report RESULTS.tsv      the table
"""
import os
import sys
import time


def build(n):
    lines = ["link set lo up"]
    names = []
    for p in range(n // 2):
        lines.append(f"link add b{p}a type veth peer name b{p}b")
        names += [f"b{p}a", f"b{p}b"]
    for i, name in enumerate(names):
        hi, lo = divmod(i, 250)
        lines.append(f"link set {name} up")
        lines.append(f"address add 10.{hi}.{lo}.1/24 dev {name}")
        lines.append(f"address add 2001:db8:{i:x}::1/64 dev {name} nodad")
    for i, name in enumerate(names):
        hi, lo = divmod(i, 250)
        for r in range(10):
            k = i * 10 + r
            lines.append(f"route add 172.{16 + k // 65536}.{(k // 256) % 256}.{k % 256}/32 via 10.{hi}.{lo}.2 dev {name}")
    print("\n".join(lines))


def timing(n, cli, runs):
    hadro = [cli, "--backend=linux", "network", "ip"]
    pairs = [
        ("interface ipv4 get", hadro + ["interface", "ipv4", "get"], ["ip", "-j", "-4", "addr", "show"]),
        ("interface ipv6 address list", hadro + ["interface", "ipv6", "address", "list"], ["ip", "-j", "-6", "addr", "show"]),
        ("route ipv4 list", hadro + ["route", "ipv4", "list"], ["ip", "-j", "route", "show"]),
    ]
    devnull = os.open(os.devnull, os.O_WRONLY)

    def run(argv):
        start = time.perf_counter()
        pid = os.posix_spawnp(argv[0], argv, os.environ, file_actions=[(os.POSIX_SPAWN_DUP2, devnull, 1)])
        _, status = os.waitpid(pid, 0)
        elapsed = (time.perf_counter() - start) * 1000
        if status != 0:
            sys.exit(f"linux_host.py: {' '.join(argv)} failed")
        return elapsed

    times = {}
    for _ in range(3):
        for _, a, b in pairs:
            run(a)
            run(b)
    for _ in range(runs):
        for name, a, b in pairs:
            times.setdefault((name, "hadrocli"), []).append(run(a))
            times.setdefault((name, "ip"), []).append(run(b))
    for (name, who), values in times.items():
        values.sort()
        print(f"{n}\t{name}\t{who}\t{values[len(values) // 2]:.3f}")


def report(path):
    t = {}
    names = []
    for line in open(path):
        n, name, who, ms = line.rstrip("\n").split("\t")
        t[(int(n), name, who)] = float(ms)
        if name not in names:
            names.append(name)
    sizes = sorted({k[0] for k in t})
    print("Linux host: median ms, hadrocli --backend=linux / ip -j on the same namespace, interleaved")
    print(f"  {'interfaces':<30}" + "".join(f"{n:>24}" for n in sizes))
    for name in names:
        cells = ""
        for n in sizes:
            h, i = t[(n, name, "hadrocli")], t[(n, name, "ip")]
            cells += f"{h:8.2f} /{i:7.2f} x{h / i:4.2f}"
        print(f"  {name:<30}{cells}")
    if len(sizes) > 1:
        lo, hi = sizes[0], sizes[-1]
        print(f"\n  ms per added interface, {lo} to {hi}: hadrocli / ip")
        for name in names:
            d = {who: (t[(hi, name, who)] - t[(lo, name, who)]) / (hi - lo) for who in ("hadrocli", "ip")}
            print(f"  {name:<30}{d['hadrocli']:10.4f} /{d['ip']:8.4f}")


if __name__ == "__main__":
    verb = sys.argv[1]
    if verb == "build":
        build(int(sys.argv[2]))
    elif verb == "time":
        timing(sys.argv[2], sys.argv[3], int(sys.argv[4]))
    elif verb == "report":
        report(sys.argv[2])
