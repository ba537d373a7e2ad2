"""Hands the jobs of a plan to an engine. The jobs need nothing but the plan's folder, under the same path everywhere."""

import shlex
import shutil
import subprocess

from plan import Refusal


def ranges(numbers):
    """1,2,3,7 as 1-3,7."""
    parts = []
    for number in numbers:
        if parts and parts[-1][1] == number - 1:
            parts[-1][1] = number
        else:
            parts.append([number, number])
    return ",".join(str(first) if first == last else f"{first}-{last}" for first, last in parts)


def command(plan, job):
    """A shell's command for a job, whose number may be an expression of the engine's."""
    words = ["python3", "-B", plan.folder / "farm" / "farm", "job", plan.folder]
    return " ".join([*(shlex.quote(str(word)) for word in words), job])


def parallel(plan, jobs, options):
    """On this machine, or on those of a --sshloginfile. Returns when the jobs have ended: how many did not end well."""
    log = shlex.quote(str(plan.folder / "logs")) + "/{}"
    words = ["parallel", "--will-cite", "--retries", "3", *options, command(plan, "{}") + f" >>{log} 2>&1"]
    run = subprocess.run(words, input="".join(f"{job}\n" for job in jobs), text=True)
    return run.returncode


def slurm(plan, jobs, options):
    """As an array of jobs. Returns as soon as they are queued."""
    words = ["sbatch", "--parsable", "--job-name=farm", "--requeue", "--open-mode=append", "--cpus-per-task=1",
             f"--array={ranges(jobs)}", f"--chdir={plan.folder}", f"--output={plan.folder}/logs/%a", *options,
             "--wrap=exec " + command(plan, "$SLURM_ARRAY_TASK_ID")]
    run = subprocess.run(words, stdout=subprocess.PIPE, text=True)
    if run.returncode == 0:
        print(f"queued as the array {run.stdout.strip()}; 'squeue' shows it, 'scancel' ends it")
    return run.returncode


ENGINES = {"parallel": (parallel, "parallel"), "slurm": (slurm, "sbatch")}


def run(plan, name, options):
    """Runs the jobs that have a piece without a result; 0 when the engine has nothing to complain of."""
    engine, program = ENGINES[name]
    if not shutil.which(program):
        raise Refusal(f"there is no '{program}' here: install the package '{'slurm-wlm' if name == 'slurm' else name}'")
    jobs = [job for job in plan.jobs() if not all(plan.result(piece) for piece in plan.pieces(job))]
    print(f"{len(jobs)} of {plan.facts['jobs']} jobs to do", flush=True)
    return engine(plan, jobs, options) if jobs else 0
