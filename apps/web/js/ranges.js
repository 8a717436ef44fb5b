// A set of indexes as ascending, disjoint ranges [first, last]: everything of a folder of 100,000 is one range.

export class Ranges {
  constructor() {
    this.list = [];
  }

  get count() {
    return this.list.reduce((sum, [first, last]) => sum + last - first + 1, 0);
  }

  has(index) {
    let low = 0;
    let high = this.list.length - 1;
    while (low <= high) {
      const middle = (low + high) >> 1;
      const [first, last] = this.list[middle];
      if (index < first) high = middle - 1;
      else if (index > last) low = middle + 1;
      else return true;
    }
    return false;
  }

  clear() {
    this.list = [];
  }

  set(first, last) {
    this.list = last < first ? [] : [[first, last]];
  }

  add(first, last) {
    const kept = [];
    for (const [a, b] of this.list) {
      if (b < first - 1 || a > last + 1) {
        kept.push([a, b]);
      } else {
        first = Math.min(first, a);
        last = Math.max(last, b);
      }
    }
    kept.push([first, last]);
    this.list = kept.sort((a, b) => a[0] - b[0]);
  }

  remove(first, last) {
    this.list = this.list.flatMap(([a, b]) => {
      if (b < first || a > last) return [[a, b]];
      return [
        [a, first - 1],
        [last + 1, b],
      ].filter(([from, to]) => from <= to);
    });
  }

  toggle(index) {
    if (this.has(index)) this.remove(index, index);
    else this.add(index, index);
  }
}
