# Counts the records of exported JSON lines by component and by kind, on worker processes of Dask.
#
# usage: engine_dask.py PATTERN
import json
import sys

import dask.bag
import distributed


def main():
    cluster = distributed.LocalCluster(n_workers=2, threads_per_worker=1, dashboard_address=None)
    with cluster, distributed.Client(cluster):
        records = dask.bag.read_text(sys.argv[1], compression="gzip").map(json.loads)
        for column, member in (("component", "comp"), ("kind", "kind")):
            for name, count in records.pluck(member).frequencies().compute():
                print(column, name, count, sep="\t")


if __name__ == "__main__":
    main()
