import { Store, useStore } from '../api/store';

// Views are addressed by the fragment: "#/users". What stands there, without "#" and a "?" with what follows.
export interface Route {
  path: string;
  segments: string[];
  query: URLSearchParams;
}

export const kHome = '/overview';

function read(): Route {
  const text = window.location.hash.replace(/^#/, '') || kHome;
  const mark = text.indexOf('?');
  const path = mark < 0 ? text : text.slice(0, mark);
  return {
    path,
    segments: path.split('/').filter((part) => part !== ''),
    query: new URLSearchParams(mark < 0 ? '' : text.slice(mark + 1)),
  };
}

const route = new Store<Route>(read());
let focusWanted = false;

// The place of the shown entry in the browser's history, which each entry carries.
let place = placeOf(window.history.state) ?? 0;
window.history.replaceState({ place }, '');

function placeOf(state: unknown): number | null {
  const { place: found } = (state ?? {}) as { place?: unknown };
  return typeof found === 'number' ? found : null;
}

// Is told that the view would be left, which has been held back; `go` leaves it after all.
export type Keeper = (go: () => void) => void;

let keeper: Keeper | null = null;

export function keepView(wanted: Keeper): () => void {
  keeper = wanted;
  return () => {
    if (keeper === wanted) keeper = null;
  };
}

window.addEventListener('hashchange', () => {
  const next = read();
  const known = placeOf(window.history.state);
  const from = place;
  const to = known ?? from + 1;
  if (known === null) window.history.replaceState({ place: to }, '');
  if (keeper !== null && next.path !== route.get().path && to !== from) {
    const { hash } = window.location;
    // Back to the form's own entry, so that the history stays as it was.
    window.history.go(from - to);
    keeper(() => {
      keeper = null;
      if (known === null) window.location.hash = hash;
      else window.history.go(to - from);
    });
    return;
  }
  place = to;
  if (next.path !== route.get().path) focusWanted = true;
  route.set(next);
});

export function useRoute(): Route {
  return useStore(route);
}

export function hrefOf(path: string): string {
  return `#${path}`;
}

// Goes to a view; `replace` leaves no trace in the browser's history.
export function navigate(path: string, { replace = false } = {}): void {
  if (replace) {
    window.history.replaceState({ place }, '', hrefOf(path));
    if (read().path !== route.get().path) focusWanted = true;
    route.set(read());
  } else {
    window.location.hash = path;
  }
}

// True once after a navigation: the new view's heading takes the focus then.
export function takeFocusRequest(): boolean {
  const wanted = focusWanted;
  focusWanted = false;
  return wanted;
}
