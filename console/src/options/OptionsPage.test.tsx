import { act, render, screen, waitFor } from '@testing-library/react';
import userEvent from '@testing-library/user-event';
import { beforeEach, describe, expect, it } from 'vitest';
import { imitate, Refusal } from '../rules/imitated';
import type { DomainOptions } from '../rules/options';
import { draftOf, merged, wantedOf } from './draft';
import OptionsPage from './OptionsPage';

const kStored: DomainOptions = {
  enable_sync_time: false,
  enable_server_signing: true,
  enable_rpc_enum_usergroup: false,
  domain_nested_group: 3,
  disable_domain_admins: false,
};
let stored: DomainOptions;

function show() {
  const appliance = imitate({
    'conf.get': () => stored,
    'conf.set': (changes) => {
      stored = { ...stored, ...changes };
      return null;
    },
  });
  render(<OptionsPage />);
  return appliance;
}

const time = () => screen.findByRole('checkbox', { name: /Set the clock/ });
const depth = () => screen.getByRole('textbox', { name: /Depth of groups/ });
const save = () => screen.getByRole('button', { name: 'Save' });

beforeEach(() => {
  stored = { ...kStored };
});

describe('the form', () => {
  it('shows what is stored, and has nothing to save', async () => {
    const appliance = show();
    expect(await time()).not.toBeChecked();
    expect(screen.getByRole('checkbox', { name: /Sign connections/ })).toBeChecked();
    expect(depth()).toHaveValue('3');
    expect(save()).toHaveAttribute('aria-disabled', 'true');
    await userEvent.click(save());
    expect(appliance.of('conf.set')).toHaveLength(0);
  });

  it('marks what is changed, sends that alone, and says that it is saved', async () => {
    const appliance = show();
    await userEvent.click(await time());
    expect(screen.getByText('Stored: Off')).toBeInTheDocument();
    await userEvent.clear(depth());
    await userEvent.type(depth(), '12{Enter}');
    expect(await screen.findByText('Saved.')).toBeInTheDocument();
    expect(appliance.of('conf.set').map((call) => call.parameters)).toEqual([
      { enable_sync_time: true, domain_nested_group: 12 },
    ]);
    expect(screen.queryByText('Changed')).not.toBeInTheDocument();
    expect(screen.getByText('Nothing is changed.')).toBeInTheDocument();
  });

  it.each(['0', '100', '-1', 'two', '1.5', ''])('refuses a depth of "%s"', async (text) => {
    const appliance = show();
    await time();
    await userEvent.clear(depth());
    if (text !== '') await userEvent.type(depth(), text);
    expect(depth()).toBeInvalid();
    expect(screen.getByText(/whole number from 1 to 99/)).toBeInTheDocument();
    await userEvent.type(depth(), '{Enter}');
    expect(appliance.of('conf.set')).toHaveLength(0);
  });

  it('discards changes', async () => {
    show();
    await userEvent.click(await time());
    await userEvent.clear(depth());
    await userEvent.click(screen.getByRole('button', { name: 'Discard changes' }));
    expect(await time()).not.toBeChecked();
    expect(depth()).toHaveValue('3');
  });

  it('keeps what was entered when saving fails', async () => {
    const appliance = show();
    appliance.handlers['conf.set'] = () => new Refusal(2617);
    await userEvent.click(await time());
    await userEvent.click(save());
    expect(await screen.findByText('Code 2617')).toBeInTheDocument();
    expect(await time()).toBeChecked();
    expect(screen.getByText('1 change is not saved.')).toBeInTheDocument();
  });
});

describe('a change from elsewhere', () => {
  it('of another option is taken over and not overwritten', async () => {
    show();
    await userEvent.click(await time());
    stored = { ...stored, disable_domain_admins: true };
    await userEvent.click(save());
    expect(await screen.findByText('Saved.')).toBeInTheDocument();
    expect(stored).toEqual({ ...kStored, enable_sync_time: true, disable_domain_admins: true });
    expect(screen.getByText(/Keep the domain’s administrators out: now On/)).toBeInTheDocument();
    expect(screen.getByRole('checkbox', { name: /administrators out/ })).toBeChecked();
  });

  it('of the same option stops the save until it is decided: mine', async () => {
    const appliance = show();
    await time();
    await userEvent.clear(depth());
    await userEvent.type(depth(), '9');
    stored = { ...stored, domain_nested_group: 20 };
    await userEvent.click(save());
    expect(await screen.findByText(/stored elsewhere is 20, entered here is 9/)).toBeInTheDocument();
    expect(appliance.of('conf.set')).toHaveLength(0);
    await userEvent.click(screen.getByRole('button', { name: 'Keep what is entered here' }));
    await userEvent.click(save());
    expect(await screen.findByText('Saved.')).toBeInTheDocument();
    expect(stored.domain_nested_group).toBe(9);
  });

  it('of the same option: theirs', async () => {
    const appliance = show();
    await time();
    await userEvent.clear(depth());
    await userEvent.type(depth(), '9');
    stored = { ...stored, domain_nested_group: 20 };
    await userEvent.click(save());
    await userEvent.click(await screen.findByRole('button', { name: 'Load what is stored' }));
    expect(depth()).toHaveValue('20');
    expect(appliance.of('conf.set')).toHaveLength(0);
  });
});

describe('leaving', () => {
  const go = (hash: string) =>
    act(() => {
      window.location.hash = hash;
    });

  it('asks while something is not saved', async () => {
    window.location.hash = '#/options';
    show();
    await userEvent.click(await time());
    go('#/events');
    expect(await screen.findByRole('dialog', { name: /Leave without saving/ })).toBeInTheDocument();
    await waitFor(() => expect(window.location.hash).toBe('#/options'));
    await userEvent.click(screen.getByRole('button', { name: 'Stay here' }));
    expect(screen.queryByRole('dialog')).not.toBeInTheDocument();
    expect(await time()).toBeChecked();
    go('#/events');
    await userEvent.click(await screen.findByRole('button', { name: /Leave and discard/ }));
    await waitFor(() => expect(window.location.hash).toBe('#/events'));
  });

  it('asks at the first press of Back, also after a link was not followed', async () => {
    window.location.hash = '#/domains';
    await waitFor(() => expect(window.history.state).not.toBeNull());
    window.location.hash = '#/options';
    await waitFor(() => expect(window.history.state).not.toBeNull());
    show();
    await userEvent.click(await time());
    go('#/events');
    await userEvent.click(await screen.findByRole('button', { name: 'Stay here' }));
    await waitFor(() => expect(window.location.hash).toBe('#/options'));
    window.history.back();
    await userEvent.click(await screen.findByRole('button', { name: /Leave and discard/ }));
    await waitFor(() => expect(window.location.hash).toBe('#/domains'));
  });

  it('does not ask when nothing is changed', async () => {
    window.location.hash = '#/options';
    show();
    await time();
    go('#/events');
    await waitFor(() => expect(window.location.hash).toBe('#/events'));
    expect(screen.queryByRole('dialog')).not.toBeInTheDocument();
  });

  it('keeps the window from being closed', async () => {
    show();
    await userEvent.click(await time());
    const closing = new Event('beforeunload', { cancelable: true });
    window.dispatchEvent(closing);
    expect(closing.defaultPrevented).toBe(true);
  });
});

describe('a draft', () => {
  it('takes over what is stored where nothing was touched', () => {
    const draft = { ...draftOf(kStored), depth: '8' };
    const next = merged(draft, { ...kStored, enable_sync_time: true });
    expect(wantedOf(next)).toEqual({ ...kStored, enable_sync_time: true, domain_nested_group: 8 });
    expect(next.elsewhere).toEqual(['enable_sync_time']);
    expect(next.conflicts).toEqual([]);
  });

  it('keeps a depth that can’t be, and calls it a conflict', () => {
    const next = merged({ ...draftOf(kStored), depth: 'x' }, { ...kStored, domain_nested_group: 4 });
    expect(next.depth).toBe('x');
    expect(next.conflicts).toEqual(['domain_nested_group']);
    expect(wantedOf(next)).toBeNull();
  });
});
