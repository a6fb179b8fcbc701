// Double-precision references for the analysis numerics, written straight from
// the textbook forms (no code of the program is called): the correlation model,
// the optimal-interpolation estimate, the Shapiro and twelve-point filters.
// Tests compare the single-precision kernels against them with a tolerance.
#ifndef KARNET_TESTS_COMMON_CLOSED_FORMS_H_
#define KARNET_TESTS_COMMON_CLOSED_FORMS_H_

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <functional>
#include <utility>
#include <vector>

namespace karnet::reference {

// Correlation at squared distance r2, with the decay length D and the zero
// crossing Z in the same units: (1 - r2/Z^2) exp(-r2 / (2 D^2)), cut to 0
// beyond r2 = 80 D^2.
inline double correlation(double r2, double D, double Z) {
  if (r2 > 80.0 * D * D) return 0.0;
  return (1.0 - r2 / (Z * Z)) * std::exp(-r2 / (2.0 * D * D));
}

// Solves a x = b for a small dense matrix (row-major, n x n) by Gaussian
// elimination with partial pivoting.
inline std::vector<double> solve(std::vector<double> a, std::vector<double> b) {
  const std::size_t n = b.size();
  for (std::size_t c = 0; c < n; ++c) {
    std::size_t p = c;
    for (std::size_t r = c + 1; r < n; ++r)
      if (std::fabs(a[r * n + c]) > std::fabs(a[p * n + c])) p = r;
    for (std::size_t q = 0; q < n; ++q) std::swap(a[c * n + q], a[p * n + q]);
    std::swap(b[c], b[p]);
    for (std::size_t r = c + 1; r < n; ++r) {
      const double f = a[r * n + c] / a[c * n + c];
      for (std::size_t q = c; q < n; ++q) a[r * n + q] -= f * a[c * n + q];
      b[r] -= f * b[c];
    }
  }
  std::vector<double> x(n);
  for (std::size_t r = n; r-- > 0;) {
    double s = b[r];
    for (std::size_t q = r + 1; q < n; ++q) s -= a[r * n + q] * x[q];
    x[r] = s / a[r * n + r];
  }
  return x;
}

struct Cell {
  double x, y, value;
};

// Optimal-interpolation estimate at (x, y) from the cells: with C the cells'
// correlation matrix plus errorVariance/100 on the diagonal, rho the node's
// correlations with the cells and d their values,
//   mu = 1' C^-1 d / 1' C^-1 1,   estimate = mu + rho' C^-1 (d - mu 1).
inline double optimalInterpolation(const std::vector<Cell>& cells, double x, double y, double D,
                                   double Z, double errorVariance) {
  const std::size_t n = cells.size();
  std::vector<double> c(n * n), ones(n, 1.0), d(n), rho(n);
  for (std::size_t i = 0; i < n; ++i) {
    for (std::size_t j = 0; j < n; ++j) {
      const double dx = cells[i].x - cells[j].x, dy = cells[i].y - cells[j].y;
      c[i * n + j] = correlation(dx * dx + dy * dy, D, Z) + (i == j ? errorVariance / 100 : 0);
    }
    d[i] = cells[i].value;
    const double dx = cells[i].x - x, dy = cells[i].y - y;
    rho[i] = correlation(dx * dx + dy * dy, D, Z);
  }
  const std::vector<double> u = solve(c, ones), v = solve(c, d);
  double su = 0, sv = 0;
  for (std::size_t i = 0; i < n; ++i) su += u[i], sv += v[i];
  const double mu = sv / su;
  double anomaly = 0;
  for (std::size_t i = 0; i < n; ++i) anomaly += rho[i] * (v[i] - mu * u[i]);
  return mu + anomaly;
}

// An nj x nk field, element k * nj + j, with a predicate for holes.
struct Field {
  int nj, nk;
  std::vector<double> v;
  std::function<bool(double)> hole;
  double& at(int j, int k) { return v[static_cast<std::size_t>(k * nj + j)]; }
  double at(int j, int k) const { return v[static_cast<std::size_t>(k * nj + j)]; }
};

// One twelve-point smoothing: 4 x centre plus the eight neighbours (indices
// clamped into the field, holes replaced by the centre), over 12, every node
// reading the field as it was.
inline void twelvePoint(Field& f) {
  const Field src = f;
  for (int j = 0; j < f.nj; ++j) {
    for (int k = 0; k < f.nk; ++k) {
      const double z = src.at(j, k);
      if (f.hole(z)) continue;
      double sum = 4.0 * z;
      for (int dk = -1; dk <= 1; ++dk) {
        for (int dj = -1; dj <= 1; ++dj) {
          if (dj == 0 && dk == 0) continue;
          const double nb =
              src.at(std::clamp(j + dj, 0, f.nj - 1), std::clamp(k + dk, 0, f.nk - 1));
          sum += f.hole(nb) ? z : nb;
        }
      }
      f.at(j, k) = sum / 12.0;
    }
  }
}

// Shapiro filter of order n on one run: w + kappa * D^n w, with D the second
// difference w[i+1] - 2 w[i] + w[i-1] whose ends mirror (2 (w[1] - w[0]) and
// 2 (w[m-1] - w[m])) and kappa = (-1)^(n+1) / 4^n. Runs of one or two stay.
inline std::vector<double> shapiroRun(const std::vector<double>& w, int n) {
  const std::size_t len = w.size();
  if (len <= 2) return w;
  std::vector<double> d = w;
  for (int r = 0; r < n; ++r) {
    std::vector<double> e(len);
    e[0] = 2.0 * (d[1] - d[0]);
    e[len - 1] = 2.0 * (d[len - 2] - d[len - 1]);
    for (std::size_t i = 1; i + 1 < len; ++i) e[i] = d[i + 1] - 2.0 * d[i] + d[i - 1];
    d = e;
  }
  const double kappa = (n % 2 != 0 ? 1.0 : -1.0) / std::pow(4.0, n);
  std::vector<double> out(len);
  for (std::size_t i = 0; i < len; ++i) out[i] = w[i] + kappa * d[i];
  return out;
}

// The Shapiro filter of a field: every run of valid cells along each column,
// then along each row of the result.
inline void shapiro(Field& f, int n) {
  auto line = [&](int count, const std::function<double&(int)>& cell) {
    for (int start = 0; start < count;) {
      if (f.hole(cell(start))) {
        ++start;
        continue;
      }
      int end = start;
      std::vector<double> run;
      while (end < count && !f.hole(cell(end))) run.push_back(cell(end++));
      const std::vector<double> out = shapiroRun(run, n);
      for (int i = start; i < end; ++i) cell(i) = out[static_cast<std::size_t>(i - start)];
      start = end;
    }
  };
  for (int j = 0; j < f.nj; ++j) line(f.nk, [&](int k) -> double& { return f.at(j, k); });
  for (int k = 0; k < f.nk; ++k) line(f.nj, [&](int j) -> double& { return f.at(j, k); });
}

}  // namespace karnet::reference

#endif  // KARNET_TESTS_COMMON_CLOSED_FORMS_H_
