"""Writes the data of the fits from fixed seeds: python3 data.py NAME SIZE FOLDER

The numbers are those of random.Random, which are the same on every machine."""

import os
import random
import sys

DEPARTMENTS, SERVICES, STUDENT_AGES, LECTURER_AGES = 14, 2, 4, 6
YEARS, HERD_SIZE, YOUNGEST, OLDEST = 12, 600, 2, 6
ANIMALS_PER_POOL_BULL = 1500


def rows(path, head, lines):
    """A file that is there is whole: it gets its name when it is written."""
    with open(path + ".part", "w", encoding="ascii") as file:
        file.write(head + "\n")
        file.writelines(line + "\n" for line in lines)
    os.replace(path + ".part", path)


def crossed(records, folder):
    """Ratings: 3 students and 1.1 lecturers for every 70 records. A student rates lecturers of departments at random;
    within a department few are popular."""
    rng = random.Random(2)
    students, lecturers = records * 3 // 70, records * 11 // 700
    student_effect = [rng.gauss(0.0, 0.4) for _ in range(students)]
    lecturer_effect = [rng.gauss(0.0, 0.5) for _ in range(lecturers)]
    department_effect = [rng.gauss(0.0, 0.2) for _ in range(DEPARTMENTS)]
    age = [rng.randrange(STUDENT_AGES) for _ in range(students)]

    def lines():
        for r in range(records):
            s = r % students
            department, service, ripeness = (rng.randrange(k) for k in (DEPARTMENTS, SERVICES, LECTURER_AGES))
            begin, end = lecturers * department // DEPARTMENTS, lecturers * (department + 1) // DEPARTMENTS
            lecturer = begin + int(rng.random() ** 2 * (end - begin))
            y = (3.2 + student_effect[s] + lecturer_effect[lecturer] + department_effect[department] - 0.1 * service
                 + 0.05 * age[s] - 0.06 * ripeness + rng.gauss(0.0, 1.18))
            yield f"{y:.5f},{s + 1},{lecturer + 1},d{department:02},v{service},a{age[s]},e{ripeness}"

    rows(os.path.join(folder, f"crossed-{records}.csv"),
         "rating,student,lecturer,department,service,studage,lectage", lines())


def growth(records, folder):
    """Pupils, six measurements each on average, in schools of a hundred, with intercepts and slopes for both."""
    rng = random.Random(5)
    pupils = records // 6

    def pair(sd, slope_sd, correlation):
        z = rng.gauss(0.0, 1.0)
        return sd * z, slope_sd * (correlation * z + (1 - correlation ** 2) ** 0.5 * rng.gauss(0.0, 1.0))

    def lines():
        left = records
        for pupil in range(pupils):
            if pupil % 100 == 0:
                school = pair(1.5, 0.3, 0.3)
            own = pair(3.0, 0.5, 0.4)
            sex = rng.randrange(2)
            occasions = left if pupil + 1 == pupils else rng.randrange(4, 9)
            occasions = max(1, min(occasions, left - (pupils - pupil - 1)))
            left -= occasions
            first = 6.0 + rng.random()
            for occasion in range(occasions):
                age = round(first + occasion + 0.2 * rng.random() - 10.0, 2)
                y = (50.0 + school[0] + own[0] - 1.2 * sex + (4.0 + school[1] + own[1] + 0.2 * sex) * age
                     + rng.gauss(0.0, 2.0))
                yield f"{y:.4f},{age:.2f},{'fm'[sex]},s{pupil // 100 + 1},p{pupil + 1}"

    rows(os.path.join(folder, f"growth-{records}.csv"), "score,age,sex,school,pupil", lines())


class Population:
    """Herds of 600 over twelve years. Dams come from the herd; sires from a pool of all herds (70 %), from two bulls of
    the herd (25 %), or are not known."""

    def __init__(self, animals, rng):
        self.rng = rng
        self.herds = max(1, animals // HERD_SIZE)
        self.pool_size = max(1, animals // ANIMALS_PER_POOL_BULL)
        self.dams = [[] for _ in range(YEARS * self.herds)]
        self.bulls = [[] for _ in range(YEARS * self.herds)]
        self.pool, self.chosen = [], []

    def parent(self, candidates, year, herd):
        oldest, youngest = max(0, year - OLDEST), year - YOUNGEST
        if youngest < oldest:
            return None
        born = candidates[self.rng.randint(oldest, youngest) * self.herds + herd]
        return self.rng.choice(born) if born else None

    def begin(self, year):
        drawn = (self.parent(self.bulls, year, self.rng.randrange(self.herds)) for _ in range(self.pool_size))
        self.pool = [bull for bull in drawn if bull is not None]
        self.chosen = [[self.parent(self.bulls, year, h) for _ in range(2)] for h in range(self.herds)]

    def sire(self, herd):
        u = self.rng.random()
        if u < 0.70:
            return self.rng.choice(self.pool) if self.pool else None
        return self.chosen[herd][self.rng.randrange(2)] if u < 0.95 else None

    def dam(self, year, herd):
        return self.parent(self.dams, year, herd) if self.rng.random() < 0.95 else None

    def born(self, animal, year, herd):
        (self.dams if self.rng.random() < 0.5 else self.bulls)[year * self.herds + herd].append(animal)


def animal(animals, folder):
    """Heritability near a third, records on 60 % of the animals, an effect for each herd and year."""
    rng = random.Random(4)
    population = Population(animals, rng)
    records, pedigree, value = [], [], []
    herd_year_effect = [rng.gauss(0.0, 1.0) for _ in range(YEARS * population.herds)]
    year = -1
    for i in range(animals):
        now = i * YEARS // animals
        if now != year:
            year = now
            population.begin(year)
        herd = i % population.herds
        parents = population.sire(herd), population.dam(year, herd)
        known = [p for p in parents if p is not None]
        variance = 1.0 - 0.25 * len(known)
        value.append(0.5 * sum(value[p] for p in known) + rng.gauss(0.0, variance ** 0.5))
        population.born(i, year, herd)
        pedigree.append(",".join([str(i + 1)] + ["" if p is None else str(p + 1) for p in parents]))
        if rng.random() < 0.6:
            y = 10.0 + herd_year_effect[year * population.herds + herd] + value[i] + rng.gauss(0.0, 2.0 ** 0.5)
            records.append(f"{y:.5f},{i + 1},h{herd + 1}y{year + 1}")
    rows(os.path.join(folder, f"pedigree-{animals}.csv"), "id,sire,dam", pedigree)
    rows(os.path.join(folder, f"animal-{animals}.csv"), "yield,animal,herdyear", records)


WRITERS = {"crossed": crossed, "growth": growth, "animal": animal}

if __name__ == "__main__":
    name, size, target = sys.argv[1:]
    os.makedirs(target, exist_ok=True)
    WRITERS[name](int(size), target)
