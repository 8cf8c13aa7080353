#!/usr/bin/env bash
# scripts/test-cluster.sh [BUILD]
# Runs packaging/cluster/tavo.sbatch on a one-node Slurm cluster with two slots, with a PostgreSQL store. Starts and
# stops Slurm and PostgreSQL on the loopback interface. The list has 121 inputs, one of them not audio; one task is
# killed halfway and requeued. Compares every row with a plain run. Needs root, because Slurm's daemons must run as root
# and the PostgreSQL server as another user. Run scripts/setup.sh build tests cluster first.
set -euo pipefail
cd -- "$(dirname -- "${BASH_SOURCE[0]}")/.."
root=$PWD
bin=$root/${1:-build/release}/bin
for tool in munged slurmctld slurmd sbatch runuser ffmpeg python3 psql; do
  command -v "$tool" >/dev/null || { echo "test-cluster: $tool is missing: run scripts/setup.sh cluster" >&2; exit 1; }
done
postgres=$(find /usr/lib/postgresql -name pg_ctl -printf '%h\n' | sort -V | tail -n 1)
dir=$(mktemp -d)
chmod 711 "$dir"

stop() {
  for name in slurmd slurmctld munged; do
    [[ ! -s $dir/run/$name.pid ]] || kill "$(cat "$dir/run/$name.pid")" 2>/dev/null || true
  done
  [[ ! -d $dir/pg/data ]] || runuser -u postgres -- "$postgres/pg_ctl" -D "$dir/pg/data" -m fast stop >/dev/null || true
  sleep 1
  rm -rf "$dir"
}
trap stop EXIT

free_port() {
  python3 -c 'import socket; s = socket.socket(); s.bind(("127.0.0.1", 0)); print(s.getsockname()[1])'
}

start_postgres() {
  local port
  port=$(free_port)
  install -d -o postgres "$dir/pg"
  runuser -u postgres -- "$postgres/initdb" -D "$dir/pg/data" -A trust >"$dir/initdb.log" 2>&1
  runuser -u postgres -- "$postgres/pg_ctl" -D "$dir/pg/data" -l "$dir/pg/log" -w \
    -o "-c listen_addresses=127.0.0.1 -p $port -k $dir/pg" start >/dev/null
  store=postgresql://postgres@127.0.0.1:$port/postgres
}

start_slurm() {
  local host
  host=$(hostname -s)
  mkdir "$dir"/{state,spool,run,log}
  head -c 1024 /dev/urandom >"$dir/munge.key"
  chmod 400 "$dir/munge.key"
  munged --force --key-file="$dir/munge.key" --socket="$dir/run/munge.sock" --pid-file="$dir/run/munged.pid" \
    --log-file="$dir/log/munged.log" --seed-file="$dir/run/seed" 2>/dev/null
  export SLURM_CONF=$dir/slurm.conf
  cat >"$SLURM_CONF" <<END
ClusterName=tavo
SlurmctldHost=$host(127.0.0.1)
AuthType=auth/munge
AuthInfo=socket=$dir/run/munge.sock
SlurmUser=root
SlurmdUser=root
StateSaveLocation=$dir/state
SlurmdSpoolDir=$dir/spool
SlurmctldPidFile=$dir/run/slurmctld.pid
SlurmdPidFile=$dir/run/slurmd.pid
SlurmctldLogFile=$dir/log/slurmctld.log
SlurmdLogFile=$dir/log/slurmd.log
SlurmctldPort=$(free_port)
SlurmdPort=$(free_port)
ProctrackType=proctrack/linuxproc
TaskPlugin=task/none
SelectType=select/cons_tres
SelectTypeParameters=CR_Core
ReturnToService=2
NodeName=$host NodeAddr=127.0.0.1 CPUs=2 State=UNKNOWN
PartitionName=main Nodes=$host Default=YES MaxTime=INFINITE State=UP
END
  slurmctld
  slurmd
  for _ in {1..100}; do
    [[ $(sinfo -h -o %T 2>/dev/null) != idle ]] || return 0
    sleep 0.2
  done
  cat "$dir"/log/slurm*.log >&2
  exit 1
}

make_songs() { # 120 songs of 20 to 45 s in three formats, and a text file
  mkdir "$dir/songs"
  "$bin/make_song" "$dir/song.wav" --seconds 60 --loud-at 20
  local i
  for i in {0..119}; do
    local format
    case $((i % 3)) in 0) format=wav ;; 1) format=flac ;; 2) format=mp3 ;; esac
    ffmpeg -nostdin -v error -ss $((i % 10)) -t $((20 + i % 25)) -i "$dir/song.wav" "$dir/songs/$i.$format"
  done
  echo "This is no song." >"$dir/songs/notes.txt"
  find "$dir/songs" -type f | sort >"$dir/list"
}

echo "test-cluster: starting PostgreSQL and Slurm, making songs" >&2
start_postgres
start_slurm
make_songs

echo "test-cluster: an array of four tasks, the first killed half-way and requeued" >&2
export TAVO=$bin/tavo
job=$(sbatch --parsable --array=1-4 --output="$dir/log/task.%a" packaging/cluster/tavo.sbatch "$store" "$dir/list")
rows() { psql -qAt "$store" -c "SELECT count(*) FROM songs" 2>/dev/null || echo 0; }
until [[ $(rows) -ge 5 ]]; do sleep 0.1; done
scancel --signal=KILL --full "${job}_1"
until [[ $(sacct 2>/dev/null; scontrol show job "${job}_1" | grep -o 'JobState=[A-Z]*') =~ FAILED|CANCELLED|COMPLETED|NODE_FAIL ]]; do sleep 0.1; done
echo "test-cluster: task 1 $(scontrol show job "${job}_1" | grep -o 'JobState=[A-Z]*'), $(rows) rows" >&2
scontrol requeue "${job}_1"
until [[ -z $(squeue -h) ]]; do sleep 0.5; done

"$bin/tavo" --format json --quiet --files-from "$dir/list" >"$dir/plain" 2>/dev/null || [[ $? -eq 1 ]]
psql -qAt "$store" -c "SELECT row_to_json(songs) FROM songs ORDER BY path" >"$dir/rows"
python3 - "$dir/plain" "$dir/rows" <<'END'
import json
import sys

plain = {song["file"]: song for song in map(json.loads, open(sys.argv[1]))}
rows = [json.loads(line) for line in open(sys.argv[2])]
keys = ("mode", "status", "sample_rate", "channels", "duration_ms", "hl_pos_ms", "bpm", "beats_ms")
stored = {bytes.fromhex(row["path"][2:]).decode(): row for row in rows}
assert len(rows) == len(stored) == len(plain) == 121, (len(rows), len(stored), len(plain))
for name, song in plain.items():
    row = stored[name]
    assert row["sentence"] == song.get("error"), (name, row["sentence"])
    for key in keys:
        assert row[key] == song.get(key), (name, key, row[key], song.get(key))
failed = [row for row in rows if row["status"] == "failed"]
assert len(failed) == 1, failed
print("121 rows, 120 results, 1 failure, every value equal to a plain run")
END
