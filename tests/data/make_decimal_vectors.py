#!/usr/bin/env python3
"""Writes decimal_vectors.tsv: arithmetic and parsing cases for DecimalTest, answered by Python's decimal
module with 38 digits and rounding half away from zero (ROUND_HALF_UP).

Run from anywhere; the output lands beside this script. The seed is fixed, so the output only changes
when this script does:
    python3 tests/data/make_decimal_vectors.py
"""

import os
import random
from decimal import ROUND_HALF_UP, Context, Decimal, DivisionByZero, InvalidOperation

PREC = 38
CTX = Context(prec=PREC, rounding=ROUND_HALF_UP, Emax=999999, Emin=-999999, clamp=0,
              traps=[InvalidOperation, DivisionByZero])
EXACT = Context(prec=200)
# Longer plain texts (results near the exponent limits) are checked by coefficient and exponent only.
PLAIN_LIMIT = 400

rng = random.Random(20260302)


def coefficient(digits):
    if digits == 1:
        return rng.randrange(0, 10)
    return rng.randrange(10 ** (digits - 1), 10 ** digits)


def make(coeff, exponent, negative=False):
    return Decimal((1 if negative else 0, tuple(int(c) for c in str(coeff)), exponent))


def money():
    """Rates, minutes and amounts as people type them."""
    return make(coefficient(rng.randint(1, 8)), -rng.choice([0, 0, 1, 2, 2, 3, 4]), rng.random() < 0.2)


def wide():
    """Any length, a third of them 30 digits or more, over a spread of scales."""
    digits = rng.randint(30, 38) if rng.random() < 0.35 else rng.randint(1, 38)
    return make(coefficient(digits), rng.randint(-45, 45), rng.random() < 0.5)


def far():
    """Scales far apart from the others, so alignment must not keep every digit."""
    digits = rng.randint(1, 38)
    return make(coefficient(digits), rng.choice([-1, 1]) * rng.randint(60, 400), rng.random() < 0.5)


def zero():
    return make(0, rng.randint(-50, 50), rng.random() < 0.5)


def operand():
    kind = rng.random()
    if kind < 0.25:
        return money()
    if kind < 0.8:
        return wide()
    if kind < 0.92:
        return far()
    return zero()


def odd38(low=2 * 10 ** 37):
    """A 38-digit odd coefficient, at least `low`."""
    return rng.randrange(low, 10 ** 38) | 1


def sign():
    return rng.random() < 0.5


def boundary_cases(op):
    """Pairs whose exact result needs a 39th digit at or near a rounding tie."""
    cases = []
    for _ in range(12):
        a_exp = rng.randint(-30, 10)
        a = make(odd38(10 ** 37), a_exp, sign())
        if op in ('add', 'sub'):
            below = rng.choice([
                make(5, a_exp - 1),                             # exactly half a unit
                make(4999999999, a_exp - 10),                   # just under half
                make(5000000001, a_exp - 10),                   # just over half
                make(5, a_exp - 1 - rng.randint(1, 5)),         # far under half
                make(coefficient(38), a_exp - rng.randint(1, 38)),
            ])
            if sign():
                below = -below
            cases.append((a, below))
        elif op == 'mul':
            choice = rng.random()
            if choice < 0.5:
                cases.append((make(odd38(), a_exp, sign()), make(rng.choice([5, 15, 25, 35]), -1, sign())))
            else:
                # two halves whose product ends in 5 and has 39 digits
                while True:
                    x = coefficient(20) // 10 * 10 + 5
                    y = coefficient(19) | 1
                    if len(str(x * y)) == 39:
                        break
                cases.append((make(x, rng.randint(-20, 5), sign()), make(y, rng.randint(-20, 5), sign())))
        else:
            divisor = rng.choice([make(2, 0), make(2, -1), make(8, 0), make(4, 1), make(16, -2)])
            if sign():
                divisor = -divisor
            cases.append((make(odd38(), a_exp, sign()), divisor))
    return cases


def special_cases(op):
    """Carries to a 39th digit, cancellation, the money cases and exact quotients."""
    nines = make(10 ** 38 - 1, 0)
    cases = [
        (nines, make(1, 0)), (nines, make(5, -1)), (nines, make(4, -1)), (-nines, make(5, -1, True)),
        (make(10 ** 37, 0), make(1, -1, True)), (make(10 ** 37, 0), make(5, -39, True)),
        (make(0, -2), make(0, -5, True)), (make(0, 3, True), make(0, 1, True)),
        (make(0, -2), make(123, 5)), (make(0, 10), make(7, -40, True)), (make(5, 0), make(0, -100)),
    ]
    a = odd38()
    cases += [(make(a, -3), make(a, -3, True)), (make(a, -3), make(a - 2, -3, True)),
              (make(a // 10, 0), make(a // 10 * 10 + 7, -1, True))]
    if op == 'mul':
        cases += [(make(80, 0), make(15, -1)), (make(75, 0), make(5, -1)), (make(1230, -2), make(1, 0)),
                  (make(100, 0), CTX.divide(make(1, 0), make(60, 0))),
                  (make(80, 0), CTX.divide(make(1, 0), make(60, 0))),
                  (make(7025, -2), CTX.divide(make(59, 0), make(60, 0))),
                  (make(1, 20), make(1, -20)), (make(10 ** 38 - 1, 0), make(10 ** 38 - 1, 0))]
    if op == 'div':
        cases += [(make(90, 0), make(60, 0)), (make(1, 0), make(60, 0)), (make(59, 0), make(60, 0)),
                  (make(1230, -2), make(3, 0)), (make(1, 5), make(2, 0)), (make(100, 0), make(4, 0)),
                  (make(7, 0), make(7, 0)), (make(0, 0), make(5, 0)), (make(0, -3), make(3, 0, True)),
                  (make(100, -2), make(4, 0)), (make(240, -2), make(2, 0)), (make(6, 3), make(2, 1)),
                  (make(12, 0), make(5, -1)), (make(1, 0), make(1024, 0)), (make(1, 0), make(2 ** 100, 0)),
                  (make(1, 0), make(3, 0)), (make(2, 0), make(3, 0, True)), (make(10 ** 38 - 1, 0), make(1, -1)),
                  (make(1, 0), make(10 ** 38 - 1, 0)), (make(10 ** 37 + 1, 0), make(10 ** 37 - 1, 0)),
                  (make(5, 0), make(0, 0)), (make(0, 0), make(0, 3)), (make(1, 0), make(0, -2, True))]
        # Exact quotients at random scales: the ideal exponent survives where the digits allow.
        for _ in range(15):
            q = make(coefficient(rng.randint(1, 12)), rng.randint(-6, 6), sign())
            b = make(coefficient(rng.randint(1, 20)), rng.randint(-10, 10), sign())
            product = EXACT.multiply(q, b)
            if len(product.as_tuple().digits) <= PREC:
                cases.append((product, b))
        # Dividends just below a multiple of divisor * 2^(32k): the long division's two-digit estimate of a
        # quotient digit comes out one too large and the divisor has to be added back.
        for a, d in [(116623855193843497661196234915839, 34272670745849609375),
                     (147047469592237453572812644024315, 43213367462158203125),
                     (1148808356456832895106387279871, 16880221664905548095703125),
                     (107700783417828083916223807487, 10550138540565967559814453125),
                     (1121883160602375874127331327, 164845914696343243122100830078125),
                     (10426985194176176631840767, 10214051826551440171897411346435546875),
                     (13147068288309092274829664, 12878587085651815868914127349853515625)]:
            cases.append((make(a, rng.randint(-6, 6), sign()), make(d, rng.randint(-6, 6), sign())))
        # Divisors of 20 or more digits exercise the wide division.
        for _ in range(12):
            cases.append((wide(), make(coefficient(rng.randint(20, 38)), rng.randint(-20, 20), sign())))
    # Results at the bottom of the exponent range: subnormal and vanishing values.
    cases += [(make(123, -1000001), make(1, 0)), (make(5, -1000036), make(1, -1))] if op != 'div' else [
        (make(123, -1000001), make(1, 36)), (make(5, -1000036), make(10, 0)), (make(4, -1000036), make(10, 0)),
        (make(1, -999999), make(1, 10))]
    return cases


def plain(value):
    text = format(value, 'f')
    # Our zero carries no sign in text.
    if value.is_zero():
        text = text.lstrip('-')
    return text


def digits_of(value):
    t = value.as_tuple()
    return ('-' if t.sign and not value.is_zero() else '') + ''.join(map(str, t.digits))


def expected(value):
    text = plain(value)
    if len(text) > PLAIN_LIMIT:
        text = '~' + digits_of(value)
    return text, str(value.as_tuple().exponent)


def apply(op, a, b):
    try:
        if op == 'add':
            return CTX.add(a, b)
        if op == 'sub':
            return CTX.subtract(a, b)
        if op == 'mul':
            return CTX.multiply(a, b)
        return CTX.divide(a, b)
    except (DivisionByZero, InvalidOperation):
        return None


def comparison_pairs():
    """Unrelated values, equal values at other scales and neighbours one unit apart."""
    pairs = [(operand(), operand()) for _ in range(60)]
    for _ in range(40):
        a = rng.choice([money, wide])()
        t = a.as_tuple()
        c = int(''.join(map(str, t.digits)))
        more = rng.randint(0, PREC - len(t.digits))
        padded = make(c * 10 ** more, t.exponent - more, bool(t.sign))
        neighbour = make(c * 10 ** more + rng.choice([1, -1]) if c else 1, t.exponent - more, bool(t.sign))
        pairs += [(a, padded), (padded, a), (a, neighbour), (neighbour, padded)]
    pairs += [(zero(), zero()) for _ in range(5)] + [(zero(), operand()) for _ in range(5)]
    return pairs


def long_text():
    """Texts with more digits than the precision, often at a tie on the 39th digit."""
    digits = ''.join(rng.choice('0123456789') for _ in range(PREC))
    digits = rng.choice('123456789') + digits[1:]
    tail = rng.choice(['5', '50000', '4999', '5001', '9', '0', '49', ''.join(
        rng.choice('0123456789') for _ in range(rng.randint(1, 25)))])
    body = digits + tail
    if rng.random() < 0.3:
        body = '9' * (PREC + 1)
    point = rng.randint(0, len(body))
    text = body[:point] + '.' + body[point:] if rng.random() < 0.7 else body
    if rng.random() < 0.3:
        text = '0' * rng.randint(1, 4) + text
    if rng.random() < 0.4:
        text += rng.choice(['e', 'E']) + rng.choice(['', '+', '-']) + str(rng.randint(0, 60))
    if rng.random() < 0.4:
        text = '-' + text
    return text


def rounding_cases():
    """Amounts rounded to a currency's places (b): ties at the first dropped digit, values below half a
    unit, long coefficients and values with fewer places than asked."""
    cases = [(money(), rng.choice([0, 2, 2, 3])) for _ in range(50)]
    cases += [(wide(), rng.choice([0, 1, 2, 3, 4])) for _ in range(20)]
    for _ in range(15):
        places = rng.choice([0, 2, 3])
        cases.append((make(coefficient(rng.randint(1, 10)) * 10 + 5, -(places + 1), sign()), places))
    cases += [(make(5, -3), 2), (make(4999, -5), 2), (make(5, -41), 2), (make(5 * 10 ** 37, -40), 2),
              (make(10 ** 38 - 1, -3), 2), (make(10 ** 38 - 1, -1), 2), (make(12345, -3, True), 2),
              (make(0, -5, True), 2), (make(0, 3), 0), (make(25, -1, True), 0)]
    return cases


def main():
    lines = [
        '# Generated by make_decimal_vectors.py (Python decimal, prec=38, ROUND_HALF_UP). Do not edit.',
        '# op<TAB>a<TAB>b<TAB>plain result (format(x, "f"); "~<sign><digits>" when too long; "none"'
        ' for division by zero)<TAB>exponent',
        '# cmp<TAB>a<TAB>b<TAB>-1, 0 or 1<TAB>"same" when a and b are equal with the same exponent',
    ]
    for op in ('add', 'sub', 'mul', 'div'):
        pairs = [(operand(), operand()) for _ in range(110)]
        pairs += [(money(), money()) for _ in range(20)]
        pairs += boundary_cases(op) + special_cases(op)
        for a, b in pairs:
            # Operands must be exact 38-digit decimals, or the test would round them on reading.
            assert len(a.as_tuple().digits) <= PREC and len(b.as_tuple().digits) <= PREC, (a, b)
            result = apply(op, a, b)
            if result is None:
                lines.append(f'{op}\t{a}\t{b}\tnone\t_')
            else:
                text, exponent = expected(result)
                lines.append(f'{op}\t{a}\t{b}\t{text}\t{exponent}')
    for a, b in comparison_pairs():
        same = 'same' if a == b and a.as_tuple().exponent == b.as_tuple().exponent else '_'
        lines.append(f'cmp\t{a}\t{b}\t{int(a.compare(b))}\t{same}')
    for _ in range(80):
        source = long_text()
        text, exponent = expected(CTX.create_decimal(source))
        lines.append(f'parse\t{source}\t_\t{text}\t{exponent}')
    for a, places in rounding_cases():
        try:
            result = a.quantize(make(1, -places), rounding=ROUND_HALF_UP, context=CTX)
        except InvalidOperation:
            result = a  # too many digits for the places: left as it is
        text, exponent = expected(result)
        lines.append(f'round\t{a}\t{places}\t{text}\t{exponent}')
    path = os.path.join(os.path.dirname(os.path.abspath(__file__)), 'decimal_vectors.tsv')
    with open(path, 'w', encoding='ascii', newline='\n') as out:
        out.write('\n'.join(lines) + '\n')


if __name__ == '__main__':
    main()
