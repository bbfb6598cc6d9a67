import { Store } from '../api/store';

export type Choice = 'system' | 'light' | 'dark';

const kKey = 'vorn-theme';
const kClass = 'pf-v6-theme-dark';

function stored(): Choice {
  try {
    const value = window.localStorage.getItem(kKey);
    return value === 'light' || value === 'dark' ? value : 'system';
  } catch {
    return 'system';
  }
}

export const theme = new Store<Choice>('system');

const system = window.matchMedia('(prefers-color-scheme: dark)');

function apply(): void {
  const choice = theme.get();
  const dark = choice === 'dark' || (choice === 'system' && system.matches);
  const root = document.documentElement;
  root.classList.toggle(kClass, dark);
  root.style.colorScheme = dark ? 'dark' : 'light';
}

// Shows the page in the chosen colours, and follows the system's when that is the choice.
export function startTheme(): void {
  theme.set(stored());
  apply();
  theme.subscribe(apply);
  system.addEventListener('change', apply);
}

export function chooseTheme(choice: Choice): void {
  theme.set(choice);
  try {
    if (choice === 'system') window.localStorage.removeItem(kKey);
    else window.localStorage.setItem(kKey, choice);
  } catch {
    // Storage may be switched off: the choice then holds for this window.
  }
}
