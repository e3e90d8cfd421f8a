"""What the process does to the engine: ends, forks, has no threads, has other interpreters, interrupts it."""

from __future__ import annotations

import os
import signal
import subprocess
import sys
import textwrap
import time

import pytest

TIMEOUT = 120
needs_posix = pytest.mark.skipif(os.name != "posix", reason="needs the signals and processes of POSIX")


def run(script: str, *args: str, **options: object) -> subprocess.CompletedProcess[str]:
    command = [sys.executable, "-X", "faulthandler", "-c", textwrap.dedent(script), *args]
    return subprocess.run(command, capture_output=True, text=True, timeout=TIMEOUT, **options)  # type: ignore[call-overload,no-any-return]


def output_of(script: str, *args: str, **options: object) -> str:
    """What a script prints, which must end well and without a word of complaint."""
    result = run(script, *args, **options)
    assert (result.returncode, result.stderr) == (0, "")
    return result.stdout


# ---- the end of the interpreter ----

DAEMONS = """
    import io, sys, threading
    import quillet

    big = b"name = call(value)\\n" * 20_000
    odd = [(f"{i}.py", b"# coding: latin-1\\nx = 1\\n") for i in range(50)]
    deep = b"x = " + b"a + " * 20_000 + b"a\\n"

    def analyze():
        quillet.analyze(big)
    def results():
        assert len(list(quillet.analyze_files([*odd, ("big.py", big)]))) == 51
    def first():
        next(quillet.analyze_files([("big.py", big)] * 20))
    def prints():
        quillet.analyze(deep)
    def names():
        quillet.bind(big)

    work = globals()[sys.argv[1]]
    if work is prints:
        sys.stdout = io.StringIO()
    ready = [threading.Event() for _ in range(5)]
    def forever(event):
        while True:
            work()
            event.set()
    for event in ready:
        threading.Thread(target=forever, args=(event,), daemon=True).start()
    for event in ready:
        event.wait()
"""


@pytest.mark.parametrize("work", ["analyze", "results", "first", "prints", "names"])
def test_daemon_threads_may_be_at_work_when_the_interpreter_ends(work: str) -> None:
    for _ in range(3):
        assert output_of(DAEMONS, work) == ""


def test_what_was_begun_can_be_read_at_the_end_of_the_interpreter() -> None:
    script = """
        import atexit
        results = None
        atexit.register(lambda: print(len(list(results)), len(list(quillet.analyze_files([("a.py", b"x")])))))
        import quillet
        results = quillet.analyze_files([(f"{i}.py", b"# coding: latin-1\\nx = 1\\n") for i in range(100)])
        next(results)
    """
    assert output_of(script) == "99 1\n"


def test_a_batch_may_be_left_open() -> None:
    script = """
        import quillet
        results = quillet.analyze_files([(f"{i}.py", b"# coding: latin-1\\nx = 1\\n" * 1000) for i in range(500)])
        next(results)
    """
    assert output_of(script) == ""


def test_a_reader_with_threads_ends_with_its_process() -> None:
    """Its threads, which took results, end while the interpreter does, and with its lock held."""
    pytest.importorskip("duckdb")
    script = """
        import duckdb, quillet
        source = b"class A:\\n def f(self): return g(1)\\n" * 20
        records = quillet.analyze_files([(f"{i}.py", source) for i in range(500)])
        print(duckdb.sql("select count(*) from records where kind = 'called'").fetchall())
    """
    for _ in range(4):
        assert output_of(script) == "[(10000,)]\n"


# ---- forks ----


@needs_posix
@pytest.mark.filterwarnings("ignore:.*fork.*:DeprecationWarning")
@pytest.mark.parametrize("child", ["pass", "results.close()", "list(quillet.analyze_files(files))"])
def test_a_fork_leaves_both_processes_whole(child: str) -> None:
    script = f"""
        import os, sys, warnings
        import quillet
        warnings.simplefilter("ignore")
        # Threads do not run so far ahead that they decode while the process forks: up to 3.11 the interpreter
        # itself may then wait for ever in the child, for a lock of its own.
        files = [(f"{{i}}.py", [b"", b"# coding: latin-1\\n"][i > 150] + b"name = 1\\n" * 50) for i in range(300)]
        results = quillet.analyze_files(files, jobs=2)
        next(results)
        process = os.fork()
        if process == 0:
            {child}
            del results
            assert len(list(quillet.analyze_files(files))) == 300
            sys.exit(7)
        assert os.waitstatus_to_exitcode(os.waitpid(process, 0)[1]) == 7
        print(len(list(results)))
        results.close()
    """
    for _ in range(3):
        assert output_of(script) == "299\n"


@needs_posix
@pytest.mark.filterwarnings("ignore:.*fork.*:DeprecationWarning")
def test_a_child_reads_what_is_left_as_well() -> None:
    script = """
        import os, sys, warnings
        import quillet
        warnings.simplefilter("ignore")
        files = [(f"{i}.py", [b"", b"# coding: latin-1\\n"][i > 150] + b"name = 1\\n") for i in range(300)]
        results = quillet.analyze_files(files, jobs=2)
        next(results)
        process = os.fork()
        rest = [result.path for result in results]
        assert rest == [path for path, _ in files[1:]]
        if process:
            print(os.waitstatus_to_exitcode(os.waitpid(process, 0)[1]))
    """
    assert output_of(script) == "0\n"


# ---- no threads ----


@pytest.mark.skipif(not sys.platform.startswith("linux"), reason="needs stacks that no memory can hold")
def test_without_threads_the_reader_does_the_work() -> None:
    script = """
        import os, resource, sys
        if len(sys.argv) == 1:
            # The stack of a thread is as large as that of the program when it starts.
            resource.setrlimit(resource.RLIMIT_STACK, (1 << 46, resource.RLIM_INFINITY))
            os.execv(sys.executable, [*sys.orig_argv, "again"])
        import threading
        import quillet
        try:
            threading.Thread(target=print).start()
        except RuntimeError:
            files = [(f"{i}.py", b"# coding: latin-1\\nname = 1\\n") for i in range(20)]
            results = quillet.analyze_files(files, jobs=4)
            results.start()
            print([next(results).path, *(result.path for result in results)] == [path for path, _ in files])
        else:
            print("there are threads")
    """
    hard = subprocess.run(
        [sys.executable, "-c", "import resource; print(resource.getrlimit(resource.RLIMIT_STACK)[1])"],
        capture_output=True,
        text=True,
        check=True,
    ).stdout.strip()
    if hard != "-1":
        pytest.skip("the stack is limited")
    assert output_of(script) == "True\n"


# ---- other interpreters ----

INTERPRETERS = """
    import sys
    try:
        import _interpreters
        create, execute = _interpreters.create, _interpreters.exec
    except ImportError:
        import _xxsubinterpreters as _interpreters
        create, execute = lambda kind: _interpreters.create(isolated=kind != "legacy"), _interpreters.run_string
    def run(code, kind):
        interpreter = create(kind)
        try:
            return execute(interpreter, code)
        finally:
            _interpreters.destroy(interpreter)
    refused = f'''
    import sys
    sys.path[:] = {sys.path!r}
    for _ in range(2):
        try:
            import quillet.tarvex
        except ImportError as error:
            assert "interpreter" in str(error), error
        else:
            raise SystemError("it was loaded")
    '''
    def all_are_refused():
        for kind in ("legacy", "isolated") * 3:
            problem = run(refused, kind)
            assert problem is None, problem
    def works():
        import quillet
        files = [("a.py", b"# coding: latin-1\\nx = 1\\n")] * 20
        assert [len(result.records) for result in quillet.analyze_files(files)] == [2] * 20
        assert len(quillet.analyze(files[0][1] * 2000).lines[1].records) == 2
"""


@pytest.mark.parametrize("steps", ["all_are_refused(); works()", "works(); all_are_refused(); works()"])
def test_the_main_interpreter_is_served_and_no_other(steps: str) -> None:
    output_of(textwrap.dedent(INTERPRETERS) + steps)


# ---- interrupts ----

INTERRUPTED = """
    import sys
    import quillet
    from quillet.logicalline import GetLogicalsFromText
    from quillet.tarvex import CPGenAnalyzerImpl

    many = b"name = call(value)\\n" * 400_000
    one = b"x = [" + b"name, " * 1_000_000 + b"]\\n"
    deep = b"x = " + b"(" * 1_000_000
    [line] = GetLogicalsFromText(one.decode())
    analyzer = CPGenAnalyzerImpl((3, 12))

    def analyze_many():
        quillet.analyze(many)
    def analyze_one():
        quillet.analyze(one)
    def analyze_deep():
        quillet.analyze(deep)
    def bind():
        quillet.bind(many)
    def files():
        list(quillet.analyze_files([("one.py", one)] * 4))
    def cut():
        GetLogicalsFromText(one.decode())
    def parse():
        analyzer.ParseToNode(line, False)
    def analyze_line():
        line.fParsed = False
        analyzer.AnalyzeSingleLogical(line, False)

    def state():
        return bool(line.fParsed), line.fTypeEquivs and len(line.fTypeEquivs)

    work = globals()[sys.argv[1]]
    if work is analyze_line:
        work()
    # An interrupt may come between the end of the work and the line behind it.
    states = [(False, None), state()]
    try:
        print("ready", flush=True)
        while True:
            work()
    except KeyboardInterrupt:
        # All is as if the work had not begun, or had come to its end.
        if work is analyze_line:
            assert state() in states, (state(), states)
        assert analyzer.AnalyzeSingleLogical(GetLogicalsFromText("x = y")[0], False) is None
        assert len(quillet.analyze(b"x = 1\\n").lines[0].records) == 2
        print("interrupted")
"""


@needs_posix
@pytest.mark.parametrize(
    "work", ["analyze_many", "analyze_one", "analyze_deep", "bind", "files", "cut", "parse", "analyze_line"]
)
def test_an_interrupt_ends_any_work(work: str) -> None:
    command = [sys.executable, "-c", textwrap.dedent(INTERRUPTED), work]
    with subprocess.Popen(command, stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True) as process:
        assert process.stdout is not None
        assert process.stderr is not None
        assert "ready\n" in iter(process.stdout.readline, "")
        # Into the middle of the work.
        time.sleep(0.1)
        process.send_signal(signal.SIGINT)
        output, complaints = process.communicate(timeout=TIMEOUT)
    assert output.splitlines()[-1:] == ["interrupted"], complaints
    assert process.returncode == 0


@needs_posix
def test_a_handler_that_does_not_raise_lets_work_go_on() -> None:
    script = """
        import signal
        import quillet
        from quillet import analyze, analyze_files
        seen = []
        signal.signal(signal.SIGALRM, lambda *_: seen.append(analyze(b"x = 1\\n")))
        signal.setitimer(signal.ITIMER_REAL, 0.005, 0.005)
        source = b"x = [" + b"name, " * 300_000 + b"]\\n" + b"name = call(value)\\n" * 30_000
        analysis = quillet.analyze(source)
        results = list(quillet.analyze_files([("a.py", source)] * 2))
        signal.setitimer(signal.ITIMER_REAL, 0)
        assert seen
        print(len(analysis.lines), len(analysis.errors), [len(result.records) > 100_000 for result in results])
    """
    result = run(script)
    assert result.stdout.splitlines()[-1:] == ["30001 0 [True, True]"], result.stderr


@needs_posix
def test_what_a_handler_raises_ends_the_work_of_the_host_api() -> None:
    script = """
        import signal
        import quillet
        def handler(*_):
            raise TimeoutError
        signal.signal(signal.SIGALRM, handler)
        source = b"x = [" + b"name, " * 3_000_000 + b"]\\n"
        signal.setitimer(signal.ITIMER_REAL, 0.15)
        try:
            while True:
                quillet.analyze(source)
        except TimeoutError:
            print("ended")
    """
    assert run(script).stdout.splitlines()[-1:] == ["ended"]


# ---- codecs ----

CODECS = """
    import codecs, sys
    import quillet

    def decode(source, errors="strict"):
        if len(source) % 2:
            raise RuntimeError("one line\\nand another " + "x" * 1000)
        raise KeyboardInterrupt("of the codec")
    codecs.register(lambda name: codecs.CodecInfo(decode, decode, name=name) if name == "bad" else None)
"""


def test_what_a_codec_raises_is_one_line() -> None:
    script = (
        textwrap.dedent(CODECS)
        + """
[result] = quillet.analyze_files([("a.py", b"# coding: bad\\n#")])
assert result.problem.startswith("cannot read the source as 'bad': RuntimeError: "), result.problem
assert "one line" in result.problem and "\\n" not in result.problem and len(result.problem) < 200, result.problem
try:
    quillet.analyze(b"# coding: bad\\n#")
except quillet.SourceEncodingError as error:
    assert str(error) == result.problem
"""
    )
    output_of(script)


def test_what_is_no_error_of_a_codec_is_raised() -> None:
    script = (
        textwrap.dedent(CODECS)
        + """
for jobs in (1, 3):
    files = [("a.py", b"x\\n"), ("b.py", b"# coding: bad\\n"), ("c.py", b"x\\n")]
    results = quillet.analyze_files(files, jobs=jobs)
    seen = []
    try:
        for result in results:
            seen.append(result.path)
    except KeyboardInterrupt as error:
        assert "of the codec" in str(error)
        print(seen in (["a.py"], []))
"""
    )
    assert output_of(script) == "True\nTrue\n"


def test_a_long_name_of_an_encoding_is_cut() -> None:
    from quillet import SourceEncodingError, analyze, analyze_files

    source = b"# coding: " + b"a" * 80_000 + b"\n"
    [result] = analyze_files([("a.py", source)])
    assert result.problem is not None
    assert len(result.problem) < 400
    assert result.problem.startswith("cannot read the source as 'aaa")
    with pytest.raises(SourceEncodingError) as caught:
        analyze(source)
    assert str(caught.value) == result.problem


def test_the_codec_of_escapes_does_not_warn() -> None:
    source = b"# coding: unicode_escape\nx = '\\d\\400\\\\ \\x41'\n"
    script = f"""
        import quillet
        source = {source!r}
        [result] = quillet.analyze_files([("a.py", source)])
        print(ascii([record.detail for record in result.records][1]), len(quillet.analyze(source).lines))
    """
    expected = ascii("str: '\\d\u0100\\ A'")
    assert output_of(script, env={**os.environ, "PYTHONWARNINGS": "error"}) == f"{expected} 2\n"


def test_a_codec_meets_each_thread_once() -> None:
    """What it keeps a thread stays until the thread ends, and goes with it."""
    script = """
        import codecs, threading
        import quillet

        class Kept:
            made = gone = 0
            def __init__(self):
                Kept.made += 1
            def __del__(self):
                Kept.gone += 1

        of_thread = threading.local()
        def decode(source, errors="strict"):
            if not hasattr(of_thread, "kept"):
                of_thread.kept = Kept()
            return bytes(source).decode("latin-1"), len(source)
        codecs.register(lambda name: codecs.CodecInfo(decode, decode, name=name) if name == "kept" else None)
        for _ in range(3):
            assert sum(1 for _ in quillet.analyze_files([("a.py", b"# coding: kept\\n")] * 50, jobs=2)) == 50
        assert 3 <= Kept.made <= 6, Kept.made
        assert Kept.gone == Kept.made, (Kept.gone, Kept.made)
        results = quillet.analyze_files([("a.py", b"# coding: kept\\n")] * 50, jobs=2)
        next(results)
        print("left to the end of the process")
    """
    assert output_of(script) == "left to the end of the process\n"
