"""Data files as lists of rows, their shuffled copies, and Matrix Market files."""

import csv
import random


class Table:
    """A CSV file: a header and rows of text."""

    def __init__(self, header, rows):
        self.header = header
        self.rows = rows

    @classmethod
    def read(cls, path):
        with open(path, newline="", encoding="utf-8") as file:
            rows = list(csv.reader(file))
        return cls(rows[0], rows[1:])

    def write(self, path):
        with open(path, "w", newline="", encoding="utf-8") as file:
            writer = csv.writer(file, lineterminator="\n")
            writer.writerow(self.header)
            writer.writerows(self.rows)

    def values(self, column):
        place = self.header.index(column)
        return [row[place] for row in self.rows]

    def shuffled(self, seed, renaming):
        """The rows in another order, with `renaming` {column: {old: new}} applied to the labels."""
        places = {self.header.index(column): names for column, names in renaming.items()}
        rows = [
            [places.get(k, {}).get(value, value) for k, value in enumerate(row)]
            for row in self.rows
        ]
        random.Random(seed).shuffle(rows)
        return Table(self.header, rows)


def is_missing(label):
    return label in ("", "NA", ".")


def in_order(labels):
    """Distinct labels as the command orders levels: as integers when all are, else by bytes."""
    distinct = {label for label in labels if not is_missing(label)}
    if all(is_integer(label) for label in distinct):
        return sorted(distinct, key=int)
    return sorted(distinct, key=lambda label: label.encode())


def is_integer(label):
    return label.lstrip("+-").isdigit()


def is_number(label):
    try:
        float(label)
    except ValueError:
        return False
    return True


def permutation(labels, seed):
    """{old: new}: the same labels, dealt out again."""
    dealt = list(labels)
    random.Random(seed).shuffle(dealt)
    return dict(zip(labels, dealt))


def read_matrix(path):
    """A Matrix Market file as a list of rows of numbers."""
    with open(path, encoding="utf-8") as file:
        kind = file.readline().lower()
        lines = [line.split() for line in file if line.strip() and not line.startswith("%")]
    rows, cols = int(lines[0][0]), int(lines[0][1])
    symmetric = "symmetric" in kind
    matrix = [[0.0] * cols for _ in range(rows)]
    if "coordinate" in kind:
        entries = [(int(i) - 1, int(j) - 1, float(v)) for i, j, v in lines[1:]]
    else:
        places = [(i, j) for j in range(cols) for i in range(j if symmetric else 0, rows)]
        entries = [(i, j, float(line[0])) for (i, j), line in zip(places, lines[1:])]
    for i, j, value in entries:
        matrix[i][j] = value
        if symmetric:
            matrix[j][i] = value
    return matrix


def write_rows(path, rows):
    """A general array of Matrix Market."""
    with open(path, "w", encoding="utf-8") as file:
        file.write("%%MatrixMarket matrix array real general\n")
        file.write(f"{len(rows)} {len(rows[0])}\n")
        for j in range(len(rows[0])):
            for row in rows:
                file.write(f"{row[j]!r}\n")
