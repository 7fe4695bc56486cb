#!/usr/bin/env python3
"""Writes the straight-line FFT kernels; the build runs it.

One file per radix (radix_02.cpp ... radix_43.cpp) with the four kernel forms
(complex leaf, complex combining pass, real leaf, real combining pass), plus
kernels.h (declarations) and kernel_table.cpp (the radix-indexed tables):

    python3 tools/gen_fft_kernels.py --out DIR      # all files into DIR
    python3 tools/gen_fft_kernels.py --list         # their names, one per line
    python3 tools/gen_fft_kernels.py --radix 41     # one radix file to stdout

The output is byte-reproducible (no dates, stable formatting). Constants are
computed with 60-digit decimal arithmetic and printed with 21 significant
digits. Standard library only.
"""

import argparse
import decimal
import math
import os
import sys

# The radices with a specialised kernel; everything else in the engine derives
# from this list.
RADICES = [2, 3, 4, 5, 7, 8, 9, 10, 11, 13, 14, 16, 17, 18, 19, 29, 31, 32, 37, 41, 43]
MAX_RADIX = 43
# The order in which the plan's factorisation takes radices out of a length
# (kFftRadixOrder in kernels.h): 10 first, so decimal lengths split into passes
# of ten (1000 = 10^3, not 8 * 5^3), then from the largest down.
RADIX_ORDER = [10] + sorted((r for r in RADICES if r != 10), reverse=True)
# Primes whose complex DFTs are written out by Rader's method: fewer operations
# there than the symmetric-pair form, whose count grows as the square. DFTs of
# real values keep the symmetric form, which halves its work for them.
RADER_PRIMES = [17, 29, 31, 37, 41, 43]
# The radices with a wide (four-lane AVX) variant: radix 2 has too little
# arithmetic per butterfly to pay for its lane shuffles (measured slower).
WIDE_RADICES = [r for r in RADICES if r != 2]

# Composite radices as (n1, n2): n2 inner DFTs of size n1 over inputs n2*j1 + j2,
# twiddled by W_n^(j2*k1), then n1 DFTs of size n2 (decimation in time).
SPLITS = {4: (2, 2), 8: (2, 4), 9: (3, 3), 10: (2, 5), 14: (2, 7), 16: (4, 4),
          18: (2, 9), 32: (8, 4)}

# ---- high-precision constants ------------------------------------------------------
D = decimal.Decimal
CTX = decimal.Context(prec=60)
PI = D("3.14159265358979323846264338327950288419716939937510582097494459230781640628620899")


def _taylor(x, first):
    """Sum of the cos (first=0) or sin (first=1) Taylor series at x."""
    term = D(1) if first == 0 else x
    total = term
    k = first
    x2 = CTX.multiply(x, x)
    while True:
        term = CTX.divide(CTX.multiply(-term, x2), D((k + 1) * (k + 2)))
        k += 2
        if term.copy_abs() < D("1e-70"):
            return total
        total = CTX.add(total, term)


def cos2pi(a, b):
    """cos(2*pi*a/b) to about 55 digits."""
    a %= b
    return _taylor(CTX.divide(CTX.multiply(2 * PI, D(a)), D(b)), 0)


def sin2pi(a, b):
    a %= b
    return _taylor(CTX.divide(CTX.multiply(2 * PI, D(a)), D(b)), 1)


def fmt(value):
    """A positive constant with 21 significant digits."""
    v = decimal.Context(prec=21).plus(D(value))
    text = format(v, "f")
    if "." in text:
        text = text.rstrip("0").rstrip(".")
    if "." not in text and "e" not in text:
        text += ".0"
    return text


SQRT_HALF = decimal.Context(prec=60).sqrt(D("0.5"))

# ---- straight-line code builder ------------------------------------------------------
# A value is None (known zero) or (name, negated). Statements are linear
# combinations with constant coefficients, emitted in order; dead ones are
# dropped at the end.


class Block:
    def __init__(self):
        self.stmts = []  # (name, expression, deps)
        self.count = 0
        self.adds = 0
        self.muls = 0

    def emit(self, expr, deps, prefix="t"):
        name = "%s%d" % (prefix, self.count)
        self.count += 1
        self.stmts.append((name, expr, tuple(deps)))
        return (name, False)

    def load(self, expr):
        return self.emit(expr, ())

    def lin(self, terms):
        """Sum of coefficient * value, left to right; coefficients are Decimal or int."""
        items = []
        for coef, val in terms:
            if val is None or coef == 0:
                continue
            name, neg = val
            c = D(coef)
            if neg:
                c = -c
            items.append((c, name))
        if not items:
            return None
        if len(items) == 1 and items[0][0].copy_abs() == 1:
            return (items[0][1], items[0][0] < 0)
        negate = False
        if items[0][0] < 0:
            if len(items) > 1 and items[1][0] > 0:
                items[0], items[1] = items[1], items[0]  # -a + b == b - a exactly
            else:
                items = [(-c, n) for c, n in items]   # -(a + b ...) exactly
                negate = True
        parts = []
        for i, (c, name) in enumerate(items):
            mag = c.copy_abs()
            term = name if mag == 1 else "%s * %s" % (fmt(mag), name)
            if i == 0:
                parts.append(term)
            else:
                parts.append(("- " if c < 0 else "+ ") + term)
        name, _ = self.emit(" ".join(parts), [n for _, n in items])
        return (name, negate)

    def raw(self, expr, deps):
        return self.emit(expr, deps)

    def load_pair(self, re_ptr, im_ptr):
        """Real and imaginary part of one complex input, loaded together."""
        a = "t%d" % self.count
        b = "t%d" % (self.count + 1)
        self.count += 2
        self.stmts.append(((a, b), "p.LdC(%s, %s, %s, %s);" % (re_ptr, im_ptr, a, b), ()))
        return (a, False), (b, False)

    def render(self, stores, indent="  "):
        """Live statements and the stores as C++ lines. A store is
        (method, pointer, value) or ("StC", re pointer, im pointer, re, im)."""
        live = set()
        for st in stores:
            for val in st[2:] if st[0] != "StC" else st[3:]:
                if val is not None:
                    live.add(val[0])
        kept = []
        for name, expr, deps in reversed(self.stmts):
            names = name if isinstance(name, tuple) else (name,)
            if any(n in live for n in names):
                kept.append((name, expr, deps))
                live.update(deps)
        kept.reverse()
        # Short live ranges: each load moves to just before its first use, and
        # each store to just after its value is complete (never before the
        # last load, so in-place forms read every leg before writing any).
        loads = [st for st in kept if not st[2]]
        order = [st for st in kept if st[2]]
        for st in loads:
            names = st[0] if isinstance(st[0], tuple) else (st[0],)
            at = next((i for i, o in enumerate(order) if any(n in o[2] for n in names)),
                      len(order))
            order.insert(at, st)
        last_load = max(i for i, o in enumerate(order) if not o[2])
        where = {}
        for i, o in enumerate(order):
            for n in (o[0] if isinstance(o[0], tuple) else (o[0],)):
                where[n] = i
        after = [[] for _ in order]
        for st in stores:
            vals = st[2:] if st[0] != "StC" else st[3:]
            at = max([last_load] + [where[v[0]] for v in vals if v is not None])
            after[at].append(st)
        ops = [0, 0]
        lines = []
        for i, (name, expr, _) in enumerate(order):
            lines += self._stmt(name, expr, indent, ops)
            for st in after[i]:
                lines.append(self._store(st, indent))
        return lines, ops

    @staticmethod
    def _store(st, indent):
        def text(val):
            return "0.0" if val is None else ("-" if val[1] else "") + val[0]
        if st[0] == "StC":
            return "%sp.StC(%s, %s, %s, %s);" % (indent, st[1], st[2], text(st[3]), text(st[4]))
        return "%sp.%s(%s, %s);" % (indent, st[0], st[1], text(st[2]))

    @staticmethod
    def _stmt(name, expr, indent, ops):
        if isinstance(name, tuple):  # a pair load
            return ["%sT %s, %s;" % (indent, name[0], name[1]), "%s%s" % (indent, expr)]
        if not expr.startswith("p.Ld"):  # not a load
            ops[0] += expr.count(" + ") + expr.count(" - ")
            ops[1] += expr.count(" * ")
        return ["%sconst T %s = %s;" % (indent, name, expr)]


def neg(v):
    return None if v is None else (v[0], not v[1])


def add(b, x, y):
    return b.lin([(1, x), (1, y)])


def sub(b, x, y):
    return b.lin([(1, x), (-1, y)])


def twiddle_const(b, v, e, n):
    """v * exp(-2 pi i e/n), with the trivial angles done by sign and swap."""
    re, im = v
    e %= n
    if e == 0:
        return v
    g = math.gcd(e, n)
    a, d = e // g, n // g
    if d == 2:
        return (neg(re), neg(im))
    if d == 4:
        return (im, neg(re)) if a == 1 else (neg(im), re)
    if d == 8:
        c = SQRT_HALF
        if a == 1:
            return (b.lin([(c, add(b, re, im))]), b.lin([(c, sub(b, im, re))]))
        if a == 3:
            return (b.lin([(c, sub(b, im, re))]), b.lin([(-c, add(b, re, im))]))
        if a == 5:
            return (b.lin([(-c, add(b, re, im))]), b.lin([(c, sub(b, re, im))]))
        return (b.lin([(c, sub(b, re, im))]), b.lin([(c, add(b, re, im))]))
    cs, sn = cos2pi(a, d), sin2pi(a, d)
    return (b.lin([(cs, re), (sn, im)]), b.lin([(cs, im), (-sn, re)]))


def is_prime(n):
    return n > 1 and all(n % d for d in range(2, int(n ** 0.5) + 1))


def balanced_split(n):
    """(n1, n2) with n1 the largest divisor of n not above its square root."""
    n1 = max(d for d in range(2, int(n ** 0.5) + 1) if n % d == 0)
    return n1, n // n1


def primitive_root(n):
    """The smallest generator of the multiplicative group modulo the prime n."""
    return next(g for g in range(2, n)
                if all(pow(g, (n - 1) // f, n) != 1 for f in range(2, n) if (n - 1) % f == 0 and is_prime(f)))


def rader_dft(b, xs):
    """Forward DFT of prime length n as a cyclic convolution of length n-1
    (Rader): with b_q = x[g^q], X[g^-p] = x0 + sum_q b_q w^(g^(q-p)). The
    convolution is conj(DFT(conj(DFT(b) . H))) with H the DFT of
    h_t = w^(g^-t) scaled by 1/(n-1): two straight-line DFTs of the smooth
    length n-1 instead of the (n-1)^2/... products of the symmetric form."""
    n = len(xs)
    m = n - 1
    g = primitive_root(n)
    ginv = pow(g, n - 2, n)
    bseq = [xs[pow(g, q, n)] for q in range(m)]
    big = dft(b, bseq)
    scale = CTX.divide(D(1), D(m))
    conj_c = []
    for k in range(m):
        # H_k = (1/m) sum_t exp(-2 pi i (g^-t / n + t k / m)), angles over n*m.
        hr, hi = D(0), D(0)
        for t in range(m):
            a = pow(ginv, t, n) * m + t * k * n
            hr = CTX.add(hr, cos2pi(a, n * m))
            hi = CTX.subtract(hi, sin2pi(a, n * m))
        hr, hi = CTX.multiply(hr, scale), CTX.multiply(hi, scale)
        br, bi = big[k]
        # conj(B_k H_k) = (Br hr - Bi hi, -(Br hi + Bi hr))
        conj_c.append((b.lin([(hr, br), (-hi, bi)]), b.lin([(-hi, br), (-hr, bi)])))
    conv = dft(b, conj_c)  # conj of the convolution
    x0r, x0i = xs[0]
    out = [None] * n
    out[0] = (b.lin([(1, x0r), (1, big[0][0])]), b.lin([(1, x0i), (1, big[0][1])]))
    for p in range(m):
        cr, ci = conv[p]
        out[pow(ginv, p, n)] = (b.lin([(1, x0r), (1, cr)]), b.lin([(1, x0i), (-1, ci)]))
    return out


def dft(b, xs):
    """Forward DFT of the complex values xs (list of (re, im))."""
    n = len(xs)
    if n == 1:
        return list(xs)
    if n == 2:
        (ar, ai), (br, bi) = xs
        return [(add(b, ar, br), add(b, ai, bi)), (sub(b, ar, br), sub(b, ai, bi))]
    if n == 3:
        # X0 = x0 + s; t = X0 - 1.5 s (from X0, not from x0); c = sin(2 pi/3).
        (x0r, x0i), (x1r, x1i), (x2r, x2i) = xs
        sr, si = add(b, x1r, x2r), add(b, x1i, x2i)
        dr, di = sub(b, x1r, x2r), sub(b, x1i, x2i)
        X0r, X0i = add(b, x0r, sr), add(b, x0i, si)
        tr = b.lin([(1, X0r), (D("-1.5"), sr)])
        ti = b.lin([(1, X0i), (D("-1.5"), si)])
        c = sin2pi(1, 3)
        return [(X0r, X0i),
                (b.lin([(1, tr), (c, di)]), b.lin([(1, ti), (-c, dr)])),
                (b.lin([(1, tr), (-c, di)]), b.lin([(1, ti), (c, dr)]))]
    if n in RADER_PRIMES and any(v[1] is not None for v in xs):
        return rader_dft(b, xs)
    if is_prime(n):
        # Symmetric pairs: s_j = x_j + x_(n-j), d_j = x_j - x_(n-j).
        h = (n - 1) // 2
        x0r, x0i = xs[0]
        s = [None] + [(add(b, xs[j][0], xs[n - j][0]), add(b, xs[j][1], xs[n - j][1]))
                      for j in range(1, h + 1)]
        d = [None] + [(sub(b, xs[j][0], xs[n - j][0]), sub(b, xs[j][1], xs[n - j][1]))
                      for j in range(1, h + 1)]
        out = [None] * n
        out[0] = (b.lin([(1, x0r)] + [(1, s[j][0]) for j in range(1, h + 1)]),
                  b.lin([(1, x0i)] + [(1, s[j][1]) for j in range(1, h + 1)]))
        for q in range(1, h + 1):
            cs = [cos2pi(j * q, n) for j in range(h + 1)]
            sn = [sin2pi(j * q, n) for j in range(h + 1)]
            ar = b.lin([(1, x0r)] + [(cs[j], s[j][0]) for j in range(1, h + 1)])
            ai = b.lin([(1, x0i)] + [(cs[j], s[j][1]) for j in range(1, h + 1)])
            br = b.lin([(sn[j], d[j][1]) for j in range(1, h + 1)])
            bi = b.lin([(sn[j], d[j][0]) for j in range(1, h + 1)])
            out[q] = (add(b, ar, br), sub(b, ai, bi))
            out[n - q] = (sub(b, ar, br), add(b, ai, bi))
        return out
    n1, n2 = SPLITS[n] if n in SPLITS else balanced_split(n)
    inner = [dft(b, [xs[n2 * j1 + j2] for j1 in range(n1)]) for j2 in range(n2)]
    out = [None] * n
    for k1 in range(n1):
        col = [twiddle_const(b, inner[j2][k1], j2 * k1, n) for j2 in range(n2)]
        res = dft(b, col)
        for k2 in range(n2):
            out[k1 + n1 * k2] = res[k2]
    return out


# ---- the per-radix source ------------------------------------------------------------
def idx(base, q, stride):
    """Pointer to element q of base at the given stride."""
    if q == 0:
        return base
    return "%s + %s" % (base, stride if q == 1 else "%d * %s" % (q, stride))


def complex_core(r):
    b = Block()
    xs = [b.load_pair(idx("xr", q, "is"), idx("xi", q, "is")) for q in range(r)]
    ys = dft(b, xs)
    stores = [("StC", idx("yr", q, "os"), idx("yi", q, "os"), ys[q][0], ys[q][1]) for q in range(r)]
    return b.render(stores)


def twiddle_loads(b, r, pair, step=1):
    """Legs j at s-spaced places; legs j >= 1 multiplied by (wc[step*(j-1)] +
    i ws[step*(j-1)])."""
    xs = []
    for j in range(r):
        xr, xi = pair(j)
        if j > 0:
            c = b.load("p.LdW(wc + %d)" % (step * (j - 1)))
            s = b.load("p.LdW(ws + %d)" % (step * (j - 1)))
            deps = [xr[0], xi[0], c[0], s[0]]
            # p.Tw0 keeps butterfly 0 untwiddled where a policy runs it in a lane.
            xr, xi = (b.raw("p.Tw0(%s, %s * %s - %s * %s)" % (xr[0], xr[0], c[0], xi[0], s[0]), deps),
                      b.raw("p.Tw0(%s, %s * %s + %s * %s)" % (xi[0], xi[0], c[0], xr[0], s[0]), deps))
        xs.append((xr, xi))
    return xs


def complex_twiddle_core(r):
    b = Block()
    # The complex combining passes read the grouped table (fft/plan.h): eight
    # doubles per leg, four cosines then four sines.
    ys = dft(b, twiddle_loads(b, r, lambda j: b.load_pair(idx("re", j, "s"), idx("im", j, "s")), 8))
    stores = [("StC", idx("re", q, "s"), idx("im", q, "s"), ys[q][0], ys[q][1]) for q in range(r)]
    return b.render(stores)


def real_core(r):
    b = Block()
    xs = [(b.load("p.Ld(%s)" % idx("x", q, "is")), None) for q in range(r)]
    ys = dft(b, xs)
    stores = [("St", idx("y", 0, "os"), ys[0][0])]
    for q in range(1, r // 2 + 1):
        stores.append(("St", idx("y", q, "os"), ys[q][0]))
    for q in range(1, (r - 1) // 2 + 1):
        stores.append(("St", idx("y", r - q, "os"), ys[q][1]))
    return b.render(stores)


def real_twiddle_core(r):
    # Group k of the combining pass: Re Y_j[k] at a + j*s, Im Y_j[k] at b + j*s
    # (b = position m-k). X[k + m q] goes to a + q*s / b + (r-1-q)*s below the
    # middle and, conjugated, to b + (r-1-q)*s / a + q*s above it.
    b = Block()
    ys = dft(b, twiddle_loads(b, r, lambda j: (b.load("p.Ld(%s)" % idx("a", j, "s")),
                                               b.load("p.LdB(%s)" % idx("b", j, "s")))))
    stores = []
    for q in range(r):
        if 2 * q < r:
            stores.append(("St", idx("a", q, "s"), ys[q][0]))
            stores.append(("StB", idx("b", r - 1 - q, "s"), ys[q][1]))
        else:
            stores.append(("StB", idx("b", r - 1 - q, "s"), ys[q][0]))
            stores.append(("St", idx("a", q, "s"), neg(ys[q][1])))
    return b.render(stores)


def real_half_core(r):
    # Group k = m/2 of an even m: real Y_j twiddled by exp(-i pi j/r).
    b = Block()
    xs = [twiddle_const(b, (b.load("p.Ld(%s)" % idx("x", j, "s")), None), j, 2 * r)
          for j in range(r)]
    ys = dft(b, xs)
    stores = []
    for q in range(r):
        if 2 * q + 1 < r:
            stores.append(("St", idx("x", q, "s"), ys[q][0]))
            stores.append(("St", idx("x", r - 1 - q, "s"), ys[q][1]))
        elif 2 * q + 1 == r:
            stores.append(("St", idx("x", q, "s"), ys[q][0]))
    return b.render(stores)


def banner(what):
    return ["// Generated at build time by tools/gen_fft_kernels.py%s. Do not edit." % what]


def core_templates(rr, cores):
    """The five per-radix DFT bodies as templates over the access policy;
    out of line from radix 8 up (see FFTK_BODY), left to the compiler below."""
    attr = "FFTK_BODY" if int(rr) >= 8 else "inline"
    signatures = [
        "Dft%s(const P& p, const double* xr, const double* xi, ptrdiff_t is, double* yr, double* yi, ptrdiff_t os)",
        "DftTw%s(const P& p, double* re, double* im, ptrdiff_t s, const double* wc, const double* ws)",
        "RealDft%s(const P& p, const double* x, ptrdiff_t is, double* y, ptrdiff_t os)",
        "RealTw%s(const P& p, double* a, double* b, ptrdiff_t s, const double* wc, const double* ws)",
        "RealHalf%s(const P& p, double* x, ptrdiff_t s)",
    ]
    out = []
    for signature, lines in zip(signatures, cores):
        out += ["template <class P>",
                "%s void %s {" % (attr, signature % rr),
                "  using T = typename P::T;"]
        out += lines
        out += ["}", ""]
    return out


def radix_file(r):
    rr = "%02d" % r
    c_lines, c_ops = complex_core(r)
    t_lines, t_ops = complex_twiddle_core(r)
    r_lines, r_ops = real_core(r)
    g_lines, g_ops = real_twiddle_core(r)
    h_lines, h_ops = real_half_core(r)
    cores = (c_lines, t_lines, r_lines, g_lines, h_lines)
    tw = r - 1
    leaf_args = ("const double* inRe, const double* inIm, double* outRe, double* outIm, "
                 "ptrdiff_t li, ptrdiff_t ls, ptrdiff_t lo, ptrdiff_t os, ptrdiff_t c")
    tw_args = ("double* re, double* im, const double* twCos, const double* twSin, "
               "ptrdiff_t os, ptrdiff_t m")
    rleaf_args = "const double* in, double* out, ptrdiff_t is, ptrdiff_t os, ptrdiff_t c"
    rtw_args = "double* data, const double* twCos, const double* twSin, ptrdiff_t os, ptrdiff_t m"
    leaf_call = "Dft%s(%%s, inRe + t * li, inIm + t * li, ls, outRe + t * lo, outIm + t * lo, os);" % rr
    # Grouped twiddles: butterfly k's entries start at (k / 4) * g + pos(k % 4),
    # pos = 0, 2, 1, 3; the sines four doubles after the cosines.
    tw_call = "DftTw%s(%%s, re + k * os, im + k * os, s, tw + %%s, tw + %%s + 4);" % rr
    rleaf_call = "RealDft%s(%%s, in + t * is, ls, out + t * %d * os, os);" % (rr, r)
    rtw_call = ("RealTw%s(%%s, data + k * os, data + (m - k) * os, s, twCos + (k - 1) * %d, "
                "twSin + (k - 1) * %d);" % (rr, tw, tw))
    out = banner(" --radix %d" % r)
    out += [
        "// Radix-%d DFT kernels. Operation counts (adds, muls): complex DFT %d, %d;" % (r, c_ops[0], c_ops[1]),
        "// twiddled complex DFT %d, %d; real DFT %d, %d; real combining group %d, %d." % (
            t_ops[0], t_ops[1], r_ops[0], r_ops[1], g_ops[0], g_ops[1]),
        "// Legend: xr/xi, x inputs; yr/yi, y outputs; re/im, a/b in-place legs; is/os/s strides",
        "// in doubles; wc/ws twiddles (cosine, negated sine) of legs 1..r-1; c repeat count;",
        "// m butterfly count; p the access policy (fft/kernel_access.h). Transforms or",
        "// butterflies run four at once in the wide variant (the same bodies compiled for",
        "// AVX in namespace wide), then in pairs, a last odd one alone.",
        "// clang-format off",
        '#include "fft/kernel_access.h"',
        '#include "fft/kernels/kernels.h"',
        "",
        "namespace {",
        "",
        "using fftk::InterleavedAccess;",
        "using fftk::LaneAccess;",
        "using fftk::ScalarAccess;",
        "",
    ]
    out += core_templates(rr, cores)
    out += ["}  // namespace", ""]
    has_wide = r in WIDE_RADICES

    def dispatch(cond, assign):
        """An exported kernel's hand-over of whole four-lane groups to the wide variant."""
        if not has_wide:
            return []
        return ["#if FFTK_WIDE", "  if (%s && fftk::WideLanes()) %s;" % (cond, assign), "#endif"]

    wide = []
    wide += [
        "#if FFTK_WIDE",
        "#pragma GCC push_options",
        '#pragma GCC target("avx")',
        "namespace {",
        "namespace wide {",
        "",
        "using fftk::Interleaved4Access;",
        "using fftk::Interleaved4FirstAccess;",
        "using fftk::Lane4Access;",
        "using fftk::Lane4TwAccess;",
        "using fftk::Lane4TwFirstAccess;",
        "",
    ]
    wide += core_templates(rr, cores)
    wide += [
        "// Transforms 0, 1, ... four at a time, three left run as four with one repeated;",
        "// returns how many ran.",
        "ptrdiff_t ComplexLeafGroups(%s) {" % leaf_args,
        "  ptrdiff_t t = 0;",
        "  if (inIm == inRe + 1 && outIm == outRe + 1) {",
        "    const Interleaved4Access p{li, lo, 0, 0};",
        "    for (; t + 3 < c; t += 4) " + leaf_call % "p",
        "    if (c - t == 3) " + leaf_call % "Interleaved4Access{li, lo, 0, 0, 2}",
        "  } else {",
        "    const Lane4Access p{li, lo, 0, 0};",
        "    for (; t + 3 < c; t += 4) " + leaf_call % "p",
        "    if (c - t == 3) " + leaf_call % "Lane4Access{li, lo, 0, 0, 2}",
        "  }",
        "  return c - t == 3 ? c : t;",
        "}",
        "",
        "// Butterflies 0..3 (0 untwiddled), then whole groups of four, each group's",
        "// twiddles of a leg one 32-byte load; m >= 4. Returns the next one (a multiple",
        "// of 4, so the pairs that follow start even).",
        "ptrdiff_t ComplexTwiddleGroups(%s) {" % tw_args,
        "  const ptrdiff_t s = m * os;",
        "  const double* tw = twCos;  // grouped: the sines follow the cosines",
        "  (void)twSin;",
        "  ptrdiff_t k = 4;",
        "  if (im == re + 1) {",
        "    DftTw%s(Interleaved4FirstAccess{os, os, 0, 0}, re, im, s, tw, tw + 4);" % rr,
        "    const Interleaved4Access p{os, os, 0, 0};",
        "    for (; k + 3 < m; k += 4) " + tw_call % ("p", "k / 4 * %d" % (8 * tw), "k / 4 * %d" % (8 * tw)),
        "  } else {",
        "    DftTw%s(Lane4TwFirstAccess{os, os, 0, 0}, re, im, s, tw, tw + 4);" % rr,
        "    const Lane4TwAccess p{os, os, 0, 0};",
        "    for (; k + 3 < m; k += 4) " + tw_call % ("p", "k / 4 * %d" % (8 * tw), "k / 4 * %d" % (8 * tw)),
        "  }",
        "  return k;",
        "}",
        "",
        "ptrdiff_t RealLeafGroups(%s) {" % rleaf_args,
        "  const ptrdiff_t ls = c * is;",
        "  const Lane4Access p{is, %d * os, 0, 0};" % r,
        "  ptrdiff_t t = 0;",
        "  for (; t + 3 < c; t += 4) " + rleaf_call % "p",
        "  if (c - t != 3) return t;",
        "  " + rleaf_call % ("Lane4Access{is, %d * os, 0, 0, 2}" % r),
        "  return c;",
        "}",
        "",
        "// Groups k = 1, 2, ... (and their mirrors m - k) below the middle, four at a time",
        "// (three left as in the leaf).",
        "ptrdiff_t RealTwiddleGroups(%s) {" % rtw_args,
        "  const ptrdiff_t s = m * os;",
        "  const Lane4Access p{os, os, -os, %d};" % tw,
        "  ptrdiff_t k = 1;",
        "  for (; 2 * (k + 3) < m; k += 4) " + rtw_call % "p",
        "  if (2 * (k + 2) >= m || 2 * (k + 3) < m) return k;  // not three groups left",
        "  " + rtw_call % ("Lane4Access{os, os, -os, %d, 2}" % tw),
        "  return k + 3;",
        "}",
        "",
        "}  // namespace wide",
        "}  // namespace",
        "#pragma GCC pop_options",
        "#endif",
        "",
    ]
    if has_wide:
        out += wide
    out += [
        "FFTK_CLONES",
        "void FftComplexLeaf%s(%s) {" % (rr, leaf_args),
        "  ptrdiff_t t = 0;",
    ] + dispatch("c >= 3", "t = wide::ComplexLeafGroups(inRe, inIm, outRe, outIm, li, ls, lo, os, c)") + [
        "  if (inIm == inRe + 1 && outIm == outRe + 1) {",
        "    const InterleavedAccess p{li, lo, 0, 0};",
        "    for (; t + 1 < c; t += 2) " + leaf_call % "p",
        "  } else {",
        "    const LaneAccess p{li, lo, 0, 0};",
        "    for (; t + 1 < c; t += 2) " + leaf_call % "p",
        "  }",
        "  for (; t < c; ++t) " + leaf_call % "ScalarAccess{}",
        "}",
        "",
        "FFTK_CLONES",
        "void FftComplexTwiddle%s(%s) {" % (rr, tw_args),
        "  const ptrdiff_t s = m * os;",
        "  const double* tw = twCos;  // grouped: the sines follow the cosines",
        "  (void)twSin;",
        "  ptrdiff_t k = 0;",
    ] + dispatch("m >= 4", "k = wide::ComplexTwiddleGroups(re, im, twCos, twSin, os, m)") + [
        "  if (k == 0) {  // butterfly 0 untwiddled, 1 alone, so that pairs start even",
        "    Dft%s(ScalarAccess{}, re, im, s, re, im, s);" % rr,
        "    if (m > 1) " + tw_call.replace("re + k * os, im + k * os", "re + os, im + os") % ("ScalarAccess{}", "2", "2"),
        "    k = 2;",
        "  }",
        "  // Pairs k, k + 1 (k even) sit at pos 0, 2 or 1, 3 of their group.",
        "  if (im == re + 1) {",
        "    const InterleavedAccess p{os, os, 0, 2};",
        "    for (; k + 1 < m; k += 2) " + tw_call % ("p", "k / 4 * %d + k %% 4 / 2" % (8 * tw), "k / 4 * %d + k %% 4 / 2" % (8 * tw)),
        "  } else {",
        "    const LaneAccess p{os, os, 0, 2};",
        "    for (; k + 1 < m; k += 2) " + tw_call % ("p", "k / 4 * %d + k %% 4 / 2" % (8 * tw), "k / 4 * %d + k %% 4 / 2" % (8 * tw)),
        "  }",
        "  for (; k < m; ++k) {",
        "    const ptrdiff_t at = k / 4 * %d + (k %% 2) * 2 + k %% 4 / 2;" % (8 * tw),
        "    " + tw_call % ("ScalarAccess{}", "at", "at"),
        "  }",
        "}",
        "",
        "FFTK_CLONES",
        "void FftRealLeaf%s(%s) {" % (rr, rleaf_args),
        "  const ptrdiff_t ls = c * is;",
        "  ptrdiff_t t = 0;",
    ] + dispatch("c >= 3", "t = wide::RealLeafGroups(in, out, is, os, c)") + [
        "  const LaneAccess p{is, %d * os, 0, 0};" % r,
        "  for (; t + 1 < c; t += 2) " + rleaf_call % "p",
        "  for (; t < c; ++t) " + rleaf_call % "ScalarAccess{}",
        "}",
        "",
        "FFTK_CLONES",
        "void FftRealTwiddle%s(%s) {" % (rr, rtw_args),
        "  const ptrdiff_t s = m * os;",
        "  RealDft%s(ScalarAccess{}, data, s, data, s);" % rr,
        "  ptrdiff_t k = 1;",
    ] + dispatch("m >= 7", "k = wide::RealTwiddleGroups(data, twCos, twSin, os, m)") + [
        "  const LaneAccess p{os, os, -os, %d};" % tw,
        "  for (; 2 * (k + 1) < m; k += 2) " + rtw_call % "p",
        "  for (; 2 * k < m; ++k) " + rtw_call % "ScalarAccess{}",
        "  if (m % 2 == 0) RealHalf" + rr + "(ScalarAccess{}, data + (m / 2) * os, s);",
        "}",
        "// clang-format on",
    ]
    return "\n".join(out) + "\n"


def header_file():
    out = banner("")
    out += ["// Declarations of the specialised kernels, four forms per radix, and the",
            "// order in which the factorisation tries the radices.",
            "#pragma once", "", "#include <cstddef>", "#include <cstdint>", "",
            '#include "fft/plan.h"', "",
            "static_assert(kFftMaxRadix == %d, \"the kernel tables run to radix %d\");" % (
                MAX_RADIX, MAX_RADIX), "",
            "inline constexpr int32_t kFftRadixOrder[] = {%s};" % ", ".join(
                str(r) for r in RADIX_ORDER), ""]
    for r in RADICES:
        rr = "%02d" % r
        out += [
            "void FftComplexLeaf%s(const double* inRe, const double* inIm, double* outRe, double* outIm," % rr,
            "                      ptrdiff_t li, ptrdiff_t ls, ptrdiff_t lo, ptrdiff_t os, ptrdiff_t c);",
            "void FftComplexTwiddle%s(double* re, double* im, const double* twCos, const double* twSin," % rr,
            "                         ptrdiff_t os, ptrdiff_t m);",
            "void FftRealLeaf%s(const double* in, double* out, ptrdiff_t is, ptrdiff_t os, ptrdiff_t c);" % rr,
            "void FftRealTwiddle%s(double* data, const double* twCos, const double* twSin, ptrdiff_t os," % rr,
            "                      ptrdiff_t m);",
        ]
    return "\n".join(out) + "\n"


def table_file():
    out = banner("")
    out += ["// The radix-indexed kernel tables (null where a radix has no specialised kernel).",
            '#include "fft/kernels/kernels.h"', ""]
    for table, typ, fn in (("kFftComplexLeaf", "FftComplexLeafFn", "FftComplexLeaf"),
                           ("kFftComplexTwiddle", "FftComplexTwiddleFn", "FftComplexTwiddle"),
                           ("kFftRealLeaf", "FftRealLeafFn", "FftRealLeaf"),
                           ("kFftRealTwiddle", "FftRealTwiddleFn", "FftRealTwiddle")):
        out.append("const %s %s[kFftMaxRadix + 1] = {" % (typ, table))
        for r in range(MAX_RADIX + 1):
            out.append("    %s,  // %d" % ("%s%02d" % (fn, r) if r in RADICES else "nullptr", r))
        out += ["};", ""]
    return "\n".join(out)


def write(path, text):
    with open(path, "w", newline="\n") as f:
        f.write(text)


def main():
    assert sorted(RADIX_ORDER) == RADICES and max(RADICES) == MAX_RADIX
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--out", help="output directory")
    parser.add_argument("--list", action="store_true", help="print the output file names")
    parser.add_argument("--radix", type=int, help="write only this radix's file to stdout")
    args = parser.parse_args()
    if args.radix is not None:
        if args.radix not in RADICES:
            sys.exit("no specialised kernel for radix %d" % args.radix)
        sys.stdout.write(radix_file(args.radix))
        return
    names = ["radix_%02d.cpp" % r for r in RADICES] + ["kernels.h", "kernel_table.cpp"]
    if args.list:
        sys.stdout.write("\n".join(names) + "\n")
        return
    if args.out is None:
        parser.error("--out, --list or --radix is required")
    os.makedirs(args.out, exist_ok=True)
    for r in RADICES:
        write(os.path.join(args.out, "radix_%02d.cpp" % r), radix_file(r))
    write(os.path.join(args.out, "kernels.h"), header_file())
    write(os.path.join(args.out, "kernel_table.cpp"), table_file())


if __name__ == "__main__":
    main()
