import { useEffect, useState } from 'react';
import { session } from './session';

// What was entered in a form and not sent when the session ended, by the form's name. Only in this window's memory, for
// the next session of the same user; a form keeps no password here.
const kept = new Map<string, unknown>();
let owner: string | null = null;

function follow(): void {
  const now = session.get();
  const user = now.state === 'active' ? now.info.user : owner;
  if (user !== owner || (now.state === 'none' && !now.ended)) kept.clear();
  owner = user;
}

follow();
session.subscribe(follow);

// What this form held when the session ended under it; undefined when nothing is kept. The same for as long as it is
// shown.
export function useRestored<T>(form: string): T | undefined {
  const [restored] = useState(() => kept.get(form) as T | undefined);
  return restored;
}

// Keeps what is entered, should the session end; null: nothing is. Leaving the form in any other way forgets it.
export function useUnsaved(form: string, entered: unknown): void {
  useEffect(() => {
    // What a view shows in its last moment is not what was entered.
    if (session.get().state !== 'active') return;
    if (entered === null) kept.delete(form);
    else kept.set(form, entered);
  });
  useEffect(
    () => () => {
      if (session.get().state === 'active') kept.delete(form);
    },
    [form],
  );
}
