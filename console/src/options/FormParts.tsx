import { Alert } from '@patternfly/react-core/dist/esm/components/Alert';
import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { Label } from '@patternfly/react-core/dist/esm/components/Label';
import type { ReactNode } from 'react';
import { t } from '../texts';
import '../directory/list/list.css';
import './form.css';

// Marks a value that is not stored yet, with what is stored.
export function Changed({ stored }: { stored: string }) {
  return (
    <span className="vorn-changed">
      <Label color="blue" isCompact>
        {t('form.changed')}
      </Label>{' '}
      <span className="vorn-list__subtle">{t('form.stored', { value: stored })}</span>
    </span>
  );
}

interface SaveBarProps {
  // How many values differ from what is stored.
  changes: number;
  busy: boolean;
  // Saving is not possible: why.
  problem?: string | undefined;
  onDiscard: () => void;
}

// The end of a form. Save and Discard stay reachable also when there is nothing to do: the focus is not lost by saving.
export function SaveBar({ changes, busy, problem, onDiscard }: SaveBarProps) {
  return (
    <div className="vorn-savebar">
      <Button
        type="submit"
        variant="primary"
        isLoading={busy}
        isAriaDisabled={busy || changes === 0 || problem !== undefined}
      >
        {t('common.save')}
      </Button>
      <Button variant="secondary" isAriaDisabled={busy || changes === 0} onClick={onDiscard}>
        {t('form.discard')}
      </Button>
      <span role="status" className="vorn-list__subtle">
        {busy
          ? t('form.saving')
          : changes === 0
            ? t('form.unchanged')
            : (problem ?? t('form.changes', { count: changes }))}
      </span>
    </div>
  );
}

interface OutcomeProps {
  saved: boolean;
  // The session had ended, and what was not saved is in the form again.
  restored: boolean;
  children?: ReactNode;
}

// A place for what became of saving; what appears in it is read out.
export function Outcome({ saved, restored, children }: OutcomeProps) {
  return (
    <div role="status">
      {restored && <Alert isInline variant="info" component="p" title={t('form.restored')} />}
      {saved && <Alert isInline variant="success" component="p" title={t('form.saved')} />}
      {children}
    </div>
  );
}

interface ConflictProps {
  title: string;
  body: ReactNode;
  onMine: () => void;
  onTheirs: () => void;
}

// Somebody else stored something else meanwhile: what shall hold?
export function Conflict({ title, body, onMine, onTheirs }: ConflictProps) {
  return (
    <div role="alert">
      <Alert
        isInline
        variant="warning"
        component="h2"
        title={title}
        actionLinks={
          <>
            <Button variant="secondary" size="sm" onClick={onTheirs}>
              {t('form.conflict.theirs')}
            </Button>
            <Button variant="link" size="sm" onClick={onMine}>
              {t('form.conflict.mine')}
            </Button>
          </>
        }
      >
        {body}
      </Alert>
    </div>
  );
}
