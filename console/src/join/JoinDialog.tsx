import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { Modal, ModalBody, ModalFooter, ModalHeader } from '@patternfly/react-core/dist/esm/components/Modal';
import { useState } from 'react';
import { useStore } from '../api/store';
import type { DomainState, NetworkInterface } from '../api/types';
import { useRestored, useUnsaved } from '../api/unsaved';
import { t } from '../texts';
import { Finished } from './Finished';
import { forgetJob, job, lastForm, startJoin } from './job';
import { JoinFormView } from './JoinFormView';
import { advancedCount, advancedFields, checkForm, type Field, type JoinForm } from './rules';
import { Running } from './Running';
import { startValues } from './startValues';
import { useSteps } from './useSteps';

interface JoinDialogProps {
  // What the appliance is a member of.
  domain: DomainState;
  interfaces: NetworkInterface[] | undefined;
  onClose: () => void;
}

const kForm = 'join-form';

// Whether there is more in the form than it began with.
function isEntered(form: JoinForm, domain: DomainState): boolean {
  return JSON.stringify({ ...form, password: '' }) !== JSON.stringify(startValues(domain));
}

// Asks for what a join needs, shows its steps while it runs, and what came of it. Can be closed at any time: a join that
// runs goes on.
export function JoinDialog({ domain, interfaces, onClose }: JoinDialogProps) {
  const now = useStore(job);
  const restored = useRestored<JoinForm>(kForm);
  const [form, setForm] = useState<JoinForm>(() => restored ?? lastForm.get() ?? startValues(domain));
  const [title] = useState(() => t(domain.enable_domain ? 'join.again' : 'join.title'));
  const [insist, setInsist] = useState(false);
  const [unfolded, setUnfolded] = useState(advancedCount(form) > 0);
  const [attempts, setAttempts] = useState(0);
  const running = now.state === 'running' && now.action === 'join';
  const done = now.state === 'done' && now.action === 'join';
  const record = useSteps(running);
  useUnsaved(kForm, !done && isEntered(form, domain) ? { ...form, password: '' } : null);

  const problems = checkForm(form);
  const change = (part: Partial<JoinForm>) => setForm((before) => ({ ...before, ...part }));
  const close = () => {
    forgetJob();
    if (job.get().state !== 'running') lastForm.set(null);
    onClose();
  };
  const submit = () => {
    const wrong = Object.keys(problems) as Field[];
    const first = wrong[0];
    if (first !== undefined) {
      setInsist(true);
      setAttempts((before) => before + 1);
      if (wrong.some((field) => advancedFields.includes(field))) setUnfolded(true);
      // After the section is drawn.
      setTimeout(() => document.getElementById(`join-${first}`)?.focus());
      return;
    }
    setInsist(false);
    const sent = form;
    setForm({ ...form, password: '' });
    void startJoin(sent);
  };

  const failed = now.state === 'failed' && now.action === 'join' ? now : null;
  return (
    <Modal
      isOpen
      variant="medium"
      onClose={close}
      aria-labelledby="join-title"
      elementToFocus="#join-domain, #join-close"
    >
      <ModalHeader title={title} labelId="join-title" />
      <ModalBody>
        {running && (
          <Running action="join" domain={now.domain} begun={now.begun} record={record} cutOff={now.cutOff} />
        )}
        {done && <Finished job={now} />}
        {!running && !done && (
          <JoinFormView
            id={kForm}
            form={form}
            onChange={change}
            problems={problems}
            insist={insist}
            attempts={attempts}
            member={domain.enable_domain ? domain.domain_name : null}
            interfaces={interfaces}
            unfolded={unfolded}
            onUnfold={setUnfolded}
            onSubmit={submit}
            failure={failed}
            restored={restored !== undefined && now.state === 'idle'}
          />
        )}
      </ModalBody>
      <ModalFooter>
        {!running && !done && (
          <Button variant="primary" type="submit" form={kForm}>
            {t(failed === null ? 'join.submit' : 'join.submitAgain')}
          </Button>
        )}
        <Button id="join-close" variant={done ? 'primary' : running ? 'secondary' : 'link'} onClick={close}>
          {t(running ? 'join.background' : done ? 'common.close' : 'common.cancel')}
        </Button>
      </ModalFooter>
    </Modal>
  );
}
